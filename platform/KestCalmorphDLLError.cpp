#include "KestCalmorphDLLError.h"

namespace kest {

void KestCalmorphDLLError::Raise(int reason) {
    KestCalmorphDLLError error;
    error.SetReason(reason);
    throw error;
}

}  // namespace kest

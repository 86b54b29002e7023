#pragma once
// A number in a value list that the reader did not take whole (an extension: the numbers are
// still read by the atoi and atof rules; the host learns where one changed).

#include <string>

namespace kest {

struct KestReadWarning {
    std::string file;       ///< the path as given to the read
    long line = 0;          ///< 1-based, of the token (of its text when the token's is unknown)
    long column = 0;        ///< 1-based; 0 with line 0 when unknown
    std::string item;       ///< item name read so far ("" outside items)
    std::string token;      ///< the token as written ("" for an empty token)
    std::string valueRead;  ///< the number the reader took, as text ("98")
    std::string kind;       ///< "partial", "empty", "overflow"
};

}  // namespace kest

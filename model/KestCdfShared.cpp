#include "KestCdfShared.h"

#include <mutex>
#include <unordered_map>

namespace kest {
namespace detail {
namespace {

// Trees may live on different threads, so the registry is guarded.
struct Registry {
    std::mutex mutex;
    std::unordered_map<const void*, std::weak_ptr<void>> entries;
};

Registry& TheRegistry() {
    static Registry* registry = new Registry();  // outlives every static tree
    return *registry;
}

}  // namespace

std::shared_ptr<void> FindLibraryAllocation(const void* p) {
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    auto it = registry.entries.find(p);
    return it == registry.entries.end() ? std::shared_ptr<void>() : it->second.lock();
}

void RegisterLibraryAllocation(const void* p, const std::weak_ptr<void>& owner) {
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    registry.entries[p] = owner;
}

void UnregisterLibraryAllocation(const void* p) noexcept {
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    registry.entries.erase(p);
}

}  // namespace detail
}  // namespace kest

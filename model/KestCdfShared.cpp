#include "KestCdfShared.h"

#include <mutex>
#include <unordered_map>

namespace kest {
namespace detail {
namespace {

// Trees may live on different threads, so the registry is guarded.
struct Registry {
    std::mutex mutex;
    std::unordered_map<const void*, std::weak_ptr<SharedAllocation>> entries;
};

Registry& TheRegistry() {
    static Registry* registry = new Registry();  // outlives every static tree
    return *registry;
}

}  // namespace

SharedAllocation::~SharedAllocation() {
    if (!m_published.load(std::memory_order_acquire)) return;
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    auto it = registry.entries.find(m_address);
    // A newer allocation at the same address may already have replaced the entry.
    if (it != registry.entries.end() && it->second.expired()) registry.entries.erase(it);
}

void SharedAllocation::Publish(const std::shared_ptr<SharedAllocation>& self) {
    if (m_published.load(std::memory_order_acquire)) return;
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    if (m_published.load(std::memory_order_relaxed)) return;
    registry.entries[m_address] = self;
    m_published.store(true, std::memory_order_release);
}

std::shared_ptr<SharedAllocation> FindLibraryAllocation(const void* p) {
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    auto it = registry.entries.find(p);
    return it == registry.entries.end() ? std::shared_ptr<SharedAllocation>() : it->second.lock();
}

}  // namespace detail
}  // namespace kest

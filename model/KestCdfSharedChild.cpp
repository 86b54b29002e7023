#include "KestCdfSharedChild.h"

#include <mutex>
#include <unordered_map>

namespace kest {
namespace {

// Trees may live on different threads, so the registry is guarded.
struct Registry {
    std::mutex mutex;
    std::unordered_map<const void*, std::weak_ptr<KestCdfSharedAllocation>> entries;
};

Registry& TheRegistry() {
    static Registry* registry = new Registry();  // outlives every static tree
    return *registry;
}

}  // namespace

KestCdfSharedAllocation::~KestCdfSharedAllocation() {
    if (!m_published.load(std::memory_order_acquire)) return;
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    auto it = registry.entries.find(m_address);
    // A newer allocation at the same address may already have replaced the entry.
    if (it != registry.entries.end() && it->second.expired()) registry.entries.erase(it);
}

void KestCdfSharedAllocation::Publish(const std::shared_ptr<KestCdfSharedAllocation>& self) {
    if (m_published.load(std::memory_order_acquire)) return;
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    if (m_published.load(std::memory_order_relaxed)) return;
    registry.entries[m_address] = self;
    m_published.store(true, std::memory_order_release);
}

std::shared_ptr<KestCdfSharedAllocation> KestCdfSharedAllocation::Find(const void* p) {
    Registry& registry = TheRegistry();
    std::lock_guard<std::mutex> lock(registry.mutex);
    auto it = registry.entries.find(p);
    return it == registry.entries.end() ? std::shared_ptr<KestCdfSharedAllocation>()
                                        : it->second.lock();
}

}  // namespace kest

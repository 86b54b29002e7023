#include "ComPtr.h"

namespace kest {

namespace {
std::atomic<long> g_liveObjects{0};
}  // namespace

RefCounted::RefCounted() noexcept { g_liveObjects.fetch_add(1, std::memory_order_relaxed); }

RefCounted::~RefCounted() { g_liveObjects.fetch_sub(1, std::memory_order_relaxed); }

long RefCounted::LiveObjects() noexcept { return g_liveObjects.load(std::memory_order_relaxed); }

}  // namespace kest

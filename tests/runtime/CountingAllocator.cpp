#include "tests/runtime/CountingAllocator.h"

#include <gst/gst.h>

#include <atomic>

namespace qivo::test {
namespace {

std::atomic<std::size_t> g_size = 0;
std::atomic<int> g_now = 0;
std::atomic<int> g_most = 0;

GstAllocator* systemMemory() {
    return gst_allocator_find(GST_ALLOCATOR_SYSMEM);
}

void left(gpointer, GstMiniObject*) {
    --g_now;
}

/// Leaves the work to the system's allocator, whose memory says by itself when it ends.
GstMemory* allocate(GstAllocator*, gsize size, GstAllocationParams* params) {
    GstAllocator* system = systemMemory();
    GstMemory* memory = gst_allocator_alloc(system, size, params);
    gst_object_unref(system);
    if (memory != nullptr && size >= g_size) {
        const int now = ++g_now;
        int most = g_most;
        while (most < now && !g_most.compare_exchange_weak(most, now)) {
        }
        gst_mini_object_weak_ref(GST_MINI_OBJECT_CAST(memory), left, nullptr);
    }
    return memory;
}

void free(GstAllocator*, GstMemory*) {}

void prepareClass(gpointer type, gpointer) {
    auto* allocator = static_cast<GstAllocatorClass*>(type);
    allocator->alloc = allocate;
    allocator->free = free;
}

GType typeOf() {
    static const GType type =
        g_type_register_static_simple(GST_TYPE_ALLOCATOR, "QivoCountingAllocator", sizeof(GstAllocatorClass),
                                      prepareClass, sizeof(GstAllocator), nullptr, static_cast<GTypeFlags>(0));
    return type;
}

} // namespace

CountingAllocator::CountingAllocator(std::size_t size) {
    g_size = size;
    g_now = 0;
    g_most = 0;
    auto* allocator = static_cast<GstAllocator*>(g_object_new(typeOf(), nullptr));
    gst_allocator_set_default(GST_ALLOCATOR(gst_object_ref_sink(allocator)));
}

CountingAllocator::~CountingAllocator() {
    gst_allocator_set_default(systemMemory());
}

int CountingAllocator::most() const {
    return g_most;
}

} // namespace qivo::test

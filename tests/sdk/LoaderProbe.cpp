// Initialises the library twice through the loader and prints what came of it.
#include "sdk/Loader.h"
#include "sdk/qivo.h"

#include <cstdio>

int main() {
    for (int i = 0; i < 2; ++i) {
        std::printf("initialize: %d\n", QIVOlib_initialize());
        std::printf("error: %s\n", qivo::loadError().c_str());
    }
    std::printf("path: %s\n", qivo::loadedLibraryPath().c_str());
    uint32_t count = 7;
    std::printf("sources: %d ", QIVOlib_find_get_current_sources(nullptr, &count) != nullptr);
    std::printf("%u\n", count);
    QIVOlib_recv_queue_t queue{1, 2, 3};
    QIVOlib_recv_get_queue(nullptr, &queue);
    std::printf("queue: %d %d %d\n", queue.video_frames, queue.audio_frames, queue.metadata_frames);
    std::printf("capture: %d\n", QIVOlib_recv_capture_v2(nullptr, nullptr, nullptr, nullptr, 5));
    std::printf("recall: %d\n", QIVOlib_recv_ptz_recall_preset(nullptr, 1, 0.5F));
    QIVOlib_destroy();
    return 0;
}

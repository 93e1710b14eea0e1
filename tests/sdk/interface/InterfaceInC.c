/* The interface is plain C. Nothing here runs: it compiles, or the interface has changed. */
#include "tests/sdk/interface/RecordLayout.h"

int qivo_interface_is_plain_c(void);

int qivo_interface_is_plain_c(void) {
    QIVOlib_video_frame_v2_t frame = {0};
    return QIVOlib_recv_capture_v2(0, &frame, 0, 0, 0);
}

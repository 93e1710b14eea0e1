/* The layout of the interface's records, in C and in C++: a library that is exchanged must find every field where it
 * was when the application was built. */
#ifndef QIVO_TESTS_RECORD_LAYOUT_H
#define QIVO_TESTS_RECORD_LAYOUT_H

#include "sdk/qivo.h"

#include <assert.h>
#include <stddef.h>

#define QIVO_FIELD(record, field, offset) static_assert(offsetof(record, field) == (offset), #record "." #field)
#define QIVO_SIZE(record, size) static_assert(sizeof(record) == (size), #record)

QIVO_FIELD(QIVOlib_source_t, p_name, 0);
QIVO_FIELD(QIVOlib_source_t, p_url_address, 8);
QIVO_SIZE(QIVOlib_source_t, 16);

QIVO_FIELD(QIVOlib_find_create_t, show_local_sources, 0);
QIVO_FIELD(QIVOlib_find_create_t, p_groups, 8);
QIVO_FIELD(QIVOlib_find_create_t, p_extra_ips, 16);
QIVO_SIZE(QIVOlib_find_create_t, 24);

QIVO_FIELD(QIVOlib_recv_create_v3_t, source, 0);
QIVO_FIELD(QIVOlib_recv_create_v3_t, color_format, 16);
QIVO_FIELD(QIVOlib_recv_create_v3_t, bandwidth, 20);
QIVO_FIELD(QIVOlib_recv_create_v3_t, allow_video_fields, 24);
QIVO_FIELD(QIVOlib_recv_create_v3_t, p_qivo_recv_name, 32);
QIVO_SIZE(QIVOlib_recv_create_v3_t, 40);

QIVO_FIELD(QIVOlib_video_frame_v2_t, xres, 0);
QIVO_FIELD(QIVOlib_video_frame_v2_t, yres, 4);
QIVO_FIELD(QIVOlib_video_frame_v2_t, FourCC, 8);
QIVO_FIELD(QIVOlib_video_frame_v2_t, frame_rate_N, 12);
QIVO_FIELD(QIVOlib_video_frame_v2_t, frame_rate_D, 16);
QIVO_FIELD(QIVOlib_video_frame_v2_t, picture_aspect_ratio, 20);
QIVO_FIELD(QIVOlib_video_frame_v2_t, frame_format_type, 24);
QIVO_FIELD(QIVOlib_video_frame_v2_t, timecode, 32);
QIVO_FIELD(QIVOlib_video_frame_v2_t, p_data, 40);
QIVO_FIELD(QIVOlib_video_frame_v2_t, line_stride_in_bytes, 48);
QIVO_FIELD(QIVOlib_video_frame_v2_t, data_size_in_bytes, 48);
QIVO_FIELD(QIVOlib_video_frame_v2_t, p_metadata, 56);
QIVO_FIELD(QIVOlib_video_frame_v2_t, timestamp, 64);
QIVO_SIZE(QIVOlib_video_frame_v2_t, 72);

QIVO_FIELD(QIVOlib_audio_frame_v2_t, sample_rate, 0);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, no_channels, 4);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, no_samples, 8);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, timecode, 16);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, p_data, 24);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, channel_stride_in_bytes, 32);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, p_metadata, 40);
QIVO_FIELD(QIVOlib_audio_frame_v2_t, timestamp, 48);
QIVO_SIZE(QIVOlib_audio_frame_v2_t, 56);

QIVO_FIELD(QIVOlib_metadata_frame_t, length, 0);
QIVO_FIELD(QIVOlib_metadata_frame_t, timecode, 8);
QIVO_FIELD(QIVOlib_metadata_frame_t, p_data, 16);
QIVO_SIZE(QIVOlib_metadata_frame_t, 24);

QIVO_FIELD(QIVOlib_recv_queue_t, video_frames, 0);
QIVO_FIELD(QIVOlib_recv_queue_t, audio_frames, 4);
QIVO_FIELD(QIVOlib_recv_queue_t, metadata_frames, 8);
QIVO_SIZE(QIVOlib_recv_queue_t, 12);

#endif

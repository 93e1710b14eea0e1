/*
 * libqivo: the C interface of the QIVO runtime.
 *
 * The interface lets an application find live sources on the local network, receive their video and sound, and steer
 * their cameras. Everything below is plain C so that a runtime can be exchanged without rebuilding the application.
 *
 * Threading
 *   Every operation may be called from any thread. Calls on one handle are serialised inside the runtime, so two
 *   threads may share a receiver; a handle must not be destroyed while another call on it is still running. Different
 *   handles never wait for each other.
 *
 * Lifetime
 *   QIVOlib_initialize comes first and is balanced by QIVOlib_destroy; calls may nest. Handles that are null, destroyed
 *   or not the runtime's own are refused: the operation answers false, null, 0 or QIVOlib_frame_type_none and touches
 *   nothing. What the runtime hands out (frames, strings, the source list) stays the runtime's: frames and strings are
 *   given back with the matching free operation, on the receiver that produced them, before that receiver is destroyed;
 *   the source list is borrowed until the next call that replaces it. Frames that are still out when their receiver is
 *   destroyed are taken back and their memory must no longer be read.
 *
 * Blocking
 *   QIVOlib_find_wait_for_sources and QIVOlib_recv_capture_v2 wait at most for the time-out given, and with a time-out
 *   of 0 not at all. Creating and destroying a receiver returns within milliseconds whatever the network does. PTZ
 *   commands are queued and return at once. The first QIVOlib_initialize loads what decodes, which takes seconds where
 *   GStreamer has not been used before. QIVOlib_find_destroy, of the last finder where there is no receiver, waits for
 *   the thread that looks for sources, milliseconds. The last QIVOlib_destroy waits for connections to be taken apart
 *   and for cameras to be stopped, at most 3 seconds.
 *
 * Text
 *   Every string is UTF-8 and NUL-terminated.
 *
 * Time
 *   A frame's timecode is the source's time. Below 9466848000000000 (the year 2000) it counts from a beginning of the
 *   stream's own; from there on it is the sender's clock when the frame was taken, since the Unix epoch, and the same
 *   for video and audio of a source. It may pass from one to the other, and back when the connection is made again.
 *
 * Changes
 *   1  first version: 21 operations.
 */
#ifndef QIVO_H
#define QIVO_H

#include <stdbool.h>
#include <stdint.h>

#if defined(QIVOLIB_BUILDING)
#define QIVOLIB_API __attribute__((visibility("default")))
#else
#define QIVOLIB_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/** An opaque finder. */
typedef struct QIVOlib_find_instance_type* QIVOlib_find_instance_t;

/** An opaque receiver. */
typedef struct QIVOlib_recv_instance_type* QIVOlib_recv_instance_t;

/** One source on the network. */
typedef struct QIVOlib_source_t {
    const char* p_name;        /**< announced name, normally MACHINE (SOURCE); null if unknown */
    const char* p_url_address; /**< address to connect to; null if unknown */
} QIVOlib_source_t;

/** Settings of a finder. */
typedef struct QIVOlib_find_create_t {
    bool show_local_sources; /**< also report the sources of this machine */
    const char* p_groups;    /**< comma-separated group names; null means the runtime's default groups. This runtime's
                                  sources are in no groups: all are reported, and a line on standard error says so */
    const char* p_extra_ips; /**< comma-separated addresses to ask besides the local network; null means none. This
                                  runtime asks the local network alone, and a line on standard error says so */
} QIVOlib_find_create_t;

/** What QIVOlib_recv_capture_v2 delivered. */
enum QIVOlib_frame_type {
    QIVOlib_frame_type_none = 0,           /**< nothing within the time-out, or a handle that was refused */
    QIVOlib_frame_type_video = 1,          /**< the video record was filled */
    QIVOlib_frame_type_audio = 2,          /**< the audio record was filled */
    QIVOlib_frame_type_metadata = 3,       /**< the metadata record was filled */
    QIVOlib_frame_type_error = 4,          /**< the connection is lost; the runtime goes on trying to restore it. This
                                                runtime restores it without a word */
    QIVOlib_frame_type_status_change = 100 /**< the source connected, or what it says about itself changed */
};

/** Pixel layouts a receiver can be asked for. */
enum QIVOlib_recv_color_format {
    QIVOlib_recv_color_format_rgba = 2,     /**< four bytes a pixel: R, G, B, alpha */
    QIVOlib_recv_color_format_fastest = 100 /**< whatever costs the runtime least; this runtime delivers RGBA */
};

/** How much of a source a receiver takes. */
enum QIVOlib_recv_bandwidth {
    QIVOlib_recv_bandwidth_lowest = 0,      /**< the source's low-bandwidth picture, if it has one, without sound */
    QIVOlib_recv_bandwidth_audio_only = 10, /**< sound without picture */
    QIVOlib_recv_bandwidth_highest = 100    /**< the full picture, without sound: this runtime brings sound to a
                                                 receiver of its own, of bandwidth audio_only */
};

/** Settings of a receiver. A source is reached by its URL, by its name, or by both. */
typedef struct QIVOlib_recv_create_v3_t {
    QIVOlib_source_t source;      /**< the source; one of the two strings may be null */
    int32_t color_format;         /**< a QIVOlib_recv_color_format */
    int32_t bandwidth;            /**< a QIVOlib_recv_bandwidth */
    bool allow_video_fields;      /**< false: every frame is progressive. This runtime delivers no other */
    const char* p_qivo_recv_name; /**< what the receiver calls itself; null for the runtime's default */
} QIVOlib_recv_create_v3_t;

/** A video frame. */
typedef struct QIVOlib_video_frame_v2_t {
    int32_t xres;               /**< width in pixels */
    int32_t yres;               /**< height in pixels */
    uint32_t FourCC;            /**< four-character code of the layout, first character in the lowest byte */
    int32_t frame_rate_N;       /**< numerator of the frame rate; 0 if unknown */
    int32_t frame_rate_D;       /**< denominator of the frame rate; at least 1 */
    float picture_aspect_ratio; /**< display width / display height */
    int32_t frame_format_type;  /**< 1: progressive */
    int64_t timecode;           /**< the source's time, in units of 100 ns */
    uint8_t* p_data;            /**< the first row; yres rows follow each other */
    union {
        int32_t line_stride_in_bytes; /**< bytes from one row to the next */
        int32_t data_size_in_bytes;   /**< bytes in all, for layouts without rows */
    };
    const char* p_metadata; /**< text that came with the frame; null if none */
    int64_t timestamp;      /**< when the frame arrived, in units of 100 ns since the Unix epoch */
} QIVOlib_video_frame_v2_t;

/** An audio frame: planar 32-bit float samples, nominally within -1 to 1. */
typedef struct QIVOlib_audio_frame_v2_t {
    int32_t sample_rate;             /**< samples a second */
    int32_t no_channels;             /**< number of planes */
    int32_t no_samples;              /**< samples in each plane */
    int64_t timecode;                /**< the source's time, in units of 100 ns */
    float* p_data;                   /**< the first plane; plane n starts n * no_samples floats after it */
    int32_t channel_stride_in_bytes; /**< bytes from one plane to the next */
    const char* p_metadata;          /**< text that came with the frame; null if none */
    int64_t timestamp;               /**< when the frame arrived, in units of 100 ns since the Unix epoch */
} QIVOlib_audio_frame_v2_t;

/** A metadata frame. */
typedef struct QIVOlib_metadata_frame_t {
    int32_t length;   /**< bytes in p_data, the terminating NUL included */
    int64_t timecode; /**< the source's time, in units of 100 ns */
    char* p_data;     /**< the text */
} QIVOlib_metadata_frame_t;

/** Frames that wait in a receiver to be captured. */
typedef struct QIVOlib_recv_queue_t {
    int32_t video_frames;    /**< video frames */
    int32_t audio_frames;    /**< audio frames */
    int32_t metadata_frames; /**< metadata frames */
} QIVOlib_recv_queue_t;

/* --- The library ------------------------------------------------------------------------------------------------- */

/** Prepares the runtime. False if it cannot run on this machine; then nothing else works. */
QIVOLIB_API bool QIVOlib_initialize(void);

/** Balances one QIVOlib_initialize. The last one ends every finder and receiver that is still open. */
QIVOLIB_API void QIVOlib_destroy(void);

/* --- Finding ----------------------------------------------------------------------------------------------------- */

/** Starts looking for sources. Null settings mean: local sources too, default groups, no extra addresses. Null if the
 *  runtime is not initialised or cannot use the network at all. */
QIVOLIB_API QIVOlib_find_instance_t QIVOlib_find_create_v2(const QIVOlib_find_create_t* p_settings);

/** Ends a finder; its source list ends with it. */
QIVOLIB_API void QIVOlib_find_destroy(QIVOlib_find_instance_t p_instance);

/** Waits until the source list differs from what this operation last reported as changed, at most timeout_in_ms. True
 *  exactly once for each change that is seen; several changes between two calls are reported as one. */
QIVOLIB_API bool QIVOlib_find_wait_for_sources(QIVOlib_find_instance_t p_instance, uint32_t timeout_in_ms);

/** The sources known now, sorted by name, without duplicates. The array and its strings are valid until the next call
 *  of this operation on the finder or the finder's end. p_no_sources receives their number; null with 0 for none. */
QIVOLIB_API const QIVOlib_source_t* QIVOlib_find_get_current_sources(QIVOlib_find_instance_t p_instance,
                                                                     uint32_t* p_no_sources);

/* --- Receiving --------------------------------------------------------------------------------------------------- */

/** Makes a receiver and begins to connect in the background; a source that cannot be reached now is tried for as long
 *  as the receiver lives. Null if the settings name no source or the runtime is not initialised. */
QIVOLIB_API QIVOlib_recv_instance_t QIVOlib_recv_create_v3(const QIVOlib_recv_create_v3_t* p_settings);

/** Ends a receiver. */
QIVOLIB_API void QIVOlib_recv_destroy(QIVOlib_recv_instance_t p_instance);

/** Takes what came next, of the kinds whose record is not null: a status change first, then a video frame or the
 *  oldest audio frame. Who keeps up with a source gets its video frames one after the other, anybody else the newest.
 *  Waits at most timeout_in_ms. Returns a QIVOlib_frame_type; only the record of that type is filled. */
QIVOLIB_API int32_t QIVOlib_recv_capture_v2(QIVOlib_recv_instance_t p_instance, QIVOlib_video_frame_v2_t* p_video,
                                            QIVOlib_audio_frame_v2_t* p_audio, QIVOlib_metadata_frame_t* p_metadata,
                                            uint32_t timeout_in_ms);

/** Gives a captured video frame back. Known by its p_data; anything else is ignored. */
QIVOLIB_API void QIVOlib_recv_free_video_v2(QIVOlib_recv_instance_t p_instance,
                                            const QIVOlib_video_frame_v2_t* p_video);

/** Gives a captured audio frame back. Known by its p_data; anything else is ignored. */
QIVOLIB_API void QIVOlib_recv_free_audio_v2(QIVOlib_recv_instance_t p_instance,
                                            const QIVOlib_audio_frame_v2_t* p_audio);

/** Gives a string back that the receiver handed out. */
QIVOLIB_API void QIVOlib_recv_free_string(QIVOlib_recv_instance_t p_instance, const char* p_string);

/** The address of the source's web control page, http or https only; null if it has none. */
QIVOLIB_API const char* QIVOlib_recv_get_web_control(QIVOlib_recv_instance_t p_instance);

/** Fills in how many frames wait to be captured; zeros if the handle is refused. */
QIVOLIB_API void QIVOlib_recv_get_queue(QIVOlib_recv_instance_t p_instance, QIVOlib_recv_queue_t* p_queue);

/** True if the source is a camera that accepts the commands below. */
QIVOLIB_API bool QIVOlib_recv_ptz_is_supported(QIVOlib_recv_instance_t p_instance);

/* --- Steering: each answers whether the command was accepted for sending ------------------------------------------ */

/** Zooms at a speed from -1 (out) to 1 (in) until the next zoom command; 0 stops. */
QIVOLIB_API bool QIVOlib_recv_ptz_zoom_speed(QIVOlib_recv_instance_t p_instance, float zoom_speed);

/** Moves at speeds from -1 (right, down) to 1 (left, up) until the next move command; 0 and 0 stop. */
QIVOLIB_API bool QIVOlib_recv_ptz_pan_tilt_speed(QIVOlib_recv_instance_t p_instance, float pan_speed, float tilt_speed);

/** Hands the focus to the camera's automatic. */
QIVOLIB_API bool QIVOlib_recv_ptz_auto_focus(QIVOlib_recv_instance_t p_instance);

/** Takes the focus by hand, to a place in the camera's range: 0 is the far end (infinity), 1 the near one. */
QIVOLIB_API bool QIVOlib_recv_ptz_focus(QIVOlib_recv_instance_t p_instance, float focus_value);

/** Keeps the camera's position as a preset, numbered from 0. */
QIVOLIB_API bool QIVOlib_recv_ptz_store_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no);

/** Moves to a stored preset at a speed from 0 (slowest) to 1. */
QIVOLIB_API bool QIVOlib_recv_ptz_recall_preset(QIVOlib_recv_instance_t p_instance, int32_t preset_no, float speed);

#ifdef __cplusplus
}
#endif

#endif /* QIVO_H */

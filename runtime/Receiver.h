#pragma once

#include "runtime/Mailbox.h"
#include "runtime/Target.h"
#include "runtime/TransportMemory.h"
#include "sdk/qivo.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>

namespace qivo::runtime {

class ReceiverLoop;
class Steering;

/// What stands behind a receiver handle.
///
/// Everything that may take time happens on a thread of its own, which outlives the object for as long as it needs to
/// take a connection apart. Thread: any, for every member.
class Receiver {
  public:
    /// What a receiver shares with others.
    struct Environment {
        /// Called on the receiver's own thread; may return null where nothing is ever announced.
        std::function<std::shared_ptr<SourceView>()> view;
        std::shared_ptr<TransportMemory> transports;
    };

    /// Bytes of a name or URL that is accepted.
    static constexpr std::size_t kTextLimit = 4096;

    /// Null if the settings name no source, or ask for pixels or a bandwidth that there is not.
    static std::unique_ptr<Receiver> create(const QIVOlib_recv_create_v3_t* settings, Environment environment);

    Receiver(const Receiver&) = delete;
    Receiver& operator=(const Receiver&) = delete;
    /// Returns at once; what is out ends soon after.
    ~Receiver();

    int32_t capture(QIVOlib_video_frame_v2_t* video, QIVOlib_audio_frame_v2_t* audio,
                    QIVOlib_metadata_frame_t* metadata, std::chrono::milliseconds timeout);
    void freeVideo(const QIVOlib_video_frame_v2_t* video);
    void freeAudio(const QIVOlib_audio_frame_v2_t* audio);
    QIVOlib_recv_queue_t queue() const;

    /// The address of the control page, to be given back with `freeString`; null if there is none.
    const char* webControl();
    /// Anything that was not handed out is ignored.
    void freeString(const char* text);

    /// What steers the source's camera; null if no camera has been found.
    std::shared_ptr<Steering> steering() const;

  private:
    explicit Receiver(std::shared_ptr<ReceiverLoop> loop);

    const std::shared_ptr<ReceiverLoop> m_loop;

    std::mutex m_mutex; // protects the rest
    std::map<const char*, std::unique_ptr<const std::string>> m_strings;
};

} // namespace qivo::runtime

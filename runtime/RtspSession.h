#pragma once

#include "runtime/GstHandles.h"
#include "runtime/Mailbox.h"
#include "runtime/SenderClock.h"
#include "runtime/SoundBranch.h"
#include "runtime/Wakeup.h"

#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace qivo::runtime {

/// What the session waits for before it gives a packet up, and all that it holds back.
inline constexpr unsigned kJitterBufferMs = 40;
/// The longest side of a picture that is decoded, in pixels.
inline constexpr int kLargestSide = 8192;
/// The longest time that connecting and each answer of the handshake may take, where a source is not known to be slow.
inline constexpr std::chrono::milliseconds kStepLimit{1500};

/// Which streams of a source are set up; never more than one.
enum class Media { video, audio };

/// One connection to an RTSP server, from the first packet sent to the last received. It is not repaired: when it ends,
/// the next one is made from scratch.
///
/// Pictures and sound go to the mailbox from threads of the session, and before them a status change. Thread:
/// constructed, asked and destroyed on one thread, which may be blocked for as long as a step of the handshake takes to
/// cancel.
class RtspSession {
  public:
    using Clock = std::chrono::steady_clock;

    struct Settings {
        std::string url;
        Media media = Media::video;
        bool tcpOnly = false;
        /// The longest time that an answer may take, once the connection stands.
        std::chrono::milliseconds stepLimit = kStepLimit;
    };

    struct Failure {
        enum class Kind {
            broken,
            noStream,    ///< the server has nothing that could be received
            noTransport, ///< the server's answers to the transport offered make no sense
        };
        Kind kind = Kind::broken;
        std::string reason; ///< for the log
    };

    /// Begins to connect. `wakeup` is notified when any of the questions below has a new answer.
    RtspSession(Settings settings, std::shared_ptr<Mailbox> mailbox, std::shared_ptr<Wakeup> wakeup);
    RtspSession(const RtspSession&) = delete;
    RtspSession& operator=(const RtspSession&) = delete;
    ~RtspSession();

    /// Nothing is handed on any more. To be called before the session ends on another thread.
    void mute() { m_muted = true; }

    /// Why the session has ended; empty while it goes on.
    std::optional<Failure> failure() const;
    /// Whether a connection stood, so that the server was asked.
    bool asked() const { return m_requests > 0; }
    /// Whether the server has described its streams.
    bool described() const { return m_described; }
    /// When the server agreed to send; empty before.
    std::optional<Clock::time_point> playingSince() const;
    /// When the last packet of a wanted stream arrived; empty before the first.
    std::optional<Clock::time_point> lastPacket() const;
    /// How long the source takes from one picture or unit of sound to the next: by what it says about its rate, or by
    /// the longest that it took of late if that is longer. 0 if neither tells.
    Clock::duration unitInterval() const;
    /// Whether enough has come to tell how long the source takes. A server may send all that it has ready at once,
    /// which tells nothing.
    bool paceKnown() const;

  private:
    struct Callbacks;

    bool build();
    void fail(Failure::Kind kind, std::string reason);
    Failure::Kind unselectedKind() const;
    void progress(GstMessage* message);
    void readRate(const GstStructure* rtp);
    void packetArrived();
    void unitComplete();
    void addBranch(GstPad* pad);
    bool addVideo(GstPad* pad, const std::string& encoding);
    std::chrono::nanoseconds decoderPatience() const;
    void deinterlace(GstPad* decoded, GstCaps* caps);
    bool addAudio(GstPad* pad, const std::string& encoding);
    void addSink(GstPad* pad);

    const Settings m_settings;
    const std::shared_ptr<Mailbox> m_mailbox;
    const std::shared_ptr<Wakeup> m_wakeup;
    SenderClock m_clock;                  // outlives the pipeline and the sound
    std::unique_ptr<SoundBranch> m_sound; // built by the source's thread; outlives the pipeline that calls it
    GstOwned<GstElement> m_pipeline;
    GstElement* m_source = nullptr;       // the pipeline's, as is the next
    GstElement* m_decoderQueue = nullptr; // before the decoder; set before there is a thread behind it

    std::atomic<bool> m_ending = false; // the destructor has begun
    std::atomic<bool> m_muted = false;
    std::atomic<bool> m_selected = false;  // a stream has been chosen; the source's thread
    std::atomic<bool> m_described = false; // the server has described its streams
    std::atomic<bool> m_linked = false;    // the chosen stream's branch has been built
    std::atomic<bool> m_making = false;    // the mailbox expects a picture; the decoder's thread
    std::int64_t m_arrived = 0;            // when the picture that is being made was there; the decoder's thread
    bool m_deinterlacing = false;          // from the first interlaced picture on; the decoder's thread
    std::atomic<int> m_requests = 0;       // sent before the server agreed; counted on the source's thread
    int m_setups = 0;                      // those of them that set a stream up; the source's thread
    std::size_t m_unitBytes = 0; // received since the last complete picture or unit of sound; the network's thread
    std::atomic<std::int64_t> m_playingSince = 0; // Clock's count; 0 means not yet, here and below
    std::atomic<std::int64_t> m_lastPacket = 0;
    std::atomic<std::int64_t> m_saidInterval = 0;
    std::atomic<std::int64_t> m_firstUnit = 0;
    std::atomic<std::int64_t> m_lastUnit = 0;
    std::atomic<std::int64_t> m_longestGap = 0; // between complete ones; it fades

    mutable std::mutex m_mutex; // protects the rest
    std::optional<Failure> m_failure;
};

} // namespace qivo::runtime

#pragma once

#include "runtime/Backoff.h"
#include "runtime/Mailbox.h"
#include "runtime/Receiver.h"
#include "runtime/RtspSession.h"
#include "runtime/Steering.h"
#include "runtime/Wakeup.h"

#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace qivo::runtime {

/// How long a stream may bring nothing over UDP before it is given up for TCP.
inline constexpr std::chrono::milliseconds kUdpLimit{1000};
/// The same over TCP, where nothing is lost and it can only be the source that takes its time, before a new attempt.
inline constexpr std::chrono::milliseconds kTcpLimit{3000};
/// How long a connected stream may bring nothing before it is made anew.
inline constexpr std::chrono::milliseconds kStallLimit{1500};
/// The same at its beginning, when it is not known how long it takes from one picture to the next.
inline constexpr std::chrono::milliseconds kFirstStallLimit{6000};
/// Intervals from picture to picture that a source with a slow rate may be silent, here and above.
inline constexpr int kStallIntervals = 3;
/// The longest time from the beginning of an attempt to the server's consent to send.
inline constexpr std::chrono::milliseconds kHandshakeLimit{5000};
/// How often the limits for a server's answers and first packet over TCP double, each time that they turned out too
/// short for a server that can be reached.
inline constexpr int kMostPatience = 2;
/// How long to leave a source in peace that answered and has nothing that could be received.
inline constexpr std::chrono::milliseconds kNoStreamPause{5000};

/// How long the next attempt waits for the last connection to be taken apart: a server may allow only one.
inline constexpr std::chrono::milliseconds kEndingLimit{500};
/// Connections that may be in the course of being taken apart, where servers hold that up.
inline constexpr int kMostEnding = 4;

/// The life of a receiver on its own thread: finds where its source is, connects, watches, and connects again, for
/// ever.
class ReceiverLoop {
  public:
    using Clock = std::chrono::steady_clock;

    ReceiverLoop(Request request, Receiver::Environment environment);

    /// Runs until `stop`, then takes everything apart. Thread: the receiver's own.
    void run();

    // --- Thread: any.
    /// Ends the loop. Returns at once.
    void stop();
    Mailbox& mailbox() { return *m_mailbox; }
    /// The address of the source's control page; empty if there is none. A camera that can be steered and announces
    /// none is taken to have one at the root of its device service: applications ask for steering only where there is
    /// such an address.
    std::string webControl() const;
    /// What steers the source's camera; null if no camera has been found.
    std::shared_ptr<Steering> steering() const;

  private:
    /// What came of an attempt.
    struct Outcome {
        RtspSession::Failure failure;
        Clock::duration connected{}; ///< how long packets came; 0 if none did
        bool silent = false;         ///< the server agreed to send, and nothing came
        bool slow = false;           ///< the server was reached and took all the time that it had
        bool described = false;      ///< the server described its streams
        bool superseded = false;     ///< the source is announced at another address
    };

    void refreshAnnouncement();
    std::string target(bool first) const;
    void endSteering();
    void steer(bool anew = false);
    void succeed();
    Outcome attempt(const std::string& url, bool tcp);
    Outcome watch(const RtspSession& session, const std::string& url, bool tcp);
    void end(std::shared_ptr<RtspSession> session);
    std::optional<Outcome> judge(const RtspSession& session, Clock::time_point began, const std::string& url,
                                 bool tcp) const;
    std::optional<Outcome> judgeSilence(const RtspSession& session, Clock::time_point began, bool tcp) const;
    Clock::time_point nextLook(const RtspSession& session, Clock::time_point began, bool tcp) const;
    Clock::duration firstPacketLimit(const RtspSession& session, bool tcp) const;
    Clock::duration patient(Clock::duration limit) const { return limit * (1 << m_patience); }
    void settle(const Outcome& outcome, const std::string& url, bool tcp);
    void pause();
    void report(const Outcome& outcome, const std::string& url);

    const Request m_request;
    const Receiver::Environment m_environment;
    const std::shared_ptr<Mailbox> m_mailbox = std::make_shared<Mailbox>();
    const std::shared_ptr<Wakeup> m_wakeup = std::make_shared<Wakeup>();
    const std::shared_ptr<std::atomic<int>> m_ending = std::make_shared<std::atomic<int>>(0);
    std::atomic<bool> m_stopped = false;
    std::atomic<bool> m_announcementsChanged = true; ///< and have not been looked at

    // Thread: the receiver's own.
    std::shared_ptr<SourceView> m_view;
    std::optional<Announcement> m_announcement; ///< the last that was seen, also after it has gone
    Backoff m_backoff;
    Clock::time_point m_nextAttempt{};
    bool m_first = true;    ///< no attempt has been made
    bool m_nextTcp = false; ///< the last attempt got consent over UDP and nothing more
    bool m_shown = false;   ///< the source has been connected
    int m_patience = 0;     ///< how often the limits have been doubled for the address that was last attempted
    std::string m_attempted;
    bool m_hurry = false;   ///< the source has been announced, or announced differently, since the last attempt
    std::string m_reported; ///< the failure that was last logged

    mutable std::mutex m_mutex; // protects the rest
    std::string m_web;
    std::string m_onvif;
    std::shared_ptr<Steering> m_steering;
    std::shared_ptr<Steering> m_successor; ///< asks the same device anew; takes over once it has its answers
};

} // namespace qivo::runtime

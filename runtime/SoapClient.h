#pragma once

#include "runtime/SoapMessage.h"
#include "runtime/SoapReply.h"
#include "runtime/SteeringTarget.h"

#include <chrono>
#include <functional>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <vector>

typedef struct _GMainContext GMainContext;
typedef struct _SoupSession SoupSession;

namespace qivo::runtime {

/// Asks SOAP services over HTTP, several at a time and each over a connection of its own, so that none waits for
/// another's answer.
///
/// Only the target's hosts are asked, also where one redirects. A login goes to its host alone and never as plain text:
/// as WS-Security's digest with every message, and as HTTP's digest where it is asked for. An https device's
/// certificate is not checked, since cameras sign their own.
///
/// WS-Security's digest holds for a moment of the device's clock, which is set anew when the device starts or learns
/// the time. So a message whose login is refused makes the clock be read, and is sent once more if that has changed.
///
/// Thread: one, which iterates the context.
class SoapClient {
  public:
    /// Redirections that are followed.
    static constexpr int kMostRedirections = 2;
    /// How often the clock of a device that refuses logins is read; a stop is asked for longer than that.
    static constexpr std::chrono::milliseconds kClockPause{500};
    /// The longest that a device may take to tell its clock, while messages wait for that.
    static constexpr std::chrono::milliseconds kClockLimit{500};
    /// What the clock has to be off for a login to be worth another try: devices tell whole seconds.
    static constexpr std::chrono::seconds kClockStep{2};

    /// What came of a message.
    struct Answer {
        unsigned status = 0;            ///< of HTTP; 0 if no answer came
        std::optional<SoapReply> reply; ///< what could be read, a fault too
        std::string failure;            ///< for the log; empty if the device did what it was asked
        bool refusesLogin = false;      ///< it may be the login that the device does not accept
        std::optional<std::chrono::system_clock::time_point> date; ///< the device's clock, by the header

        bool accepted() const { return failure.empty(); }
    };
    using Answered = std::function<void(Answer)>;

    /// The context must be the thread's default and outlive the client.
    SoapClient(GMainContext* context, SteeringTarget target);
    SoapClient(const SoapClient&) = delete;
    SoapClient& operator=(const SoapClient&) = delete;
    /// Gives up what has not been answered; nothing is called any more.
    ~SoapClient();

    /// Takes the device's clock from its answer to the question for it. A device that does not tell its time in a way
    /// that can be read tells it in the header of its answer.
    void takeClock(const Answer& answer);

    /// Calls `answered` once, `limit` after now at the latest: from an iteration of the context, or at once where the
    /// address is refused.
    void post(const std::string& url, const SoapMessage& message, std::chrono::milliseconds limit, Answered answered);
    /// Waits for the answer. Gives up early, with a failure, as soon as `ended` says so after an iteration.
    Answer ask(const std::string& url, const SoapMessage& message, std::chrono::milliseconds limit,
               const std::function<bool()>& ended);

  private:
    struct Exchange;
    struct Callbacks;
    struct Release {
        void operator()(SoupSession* session) const;
    };

    using Clock = std::chrono::steady_clock;

    bool mayLogIn(const std::string& host, const SoapMessage& message) const;
    std::string headerFor(const std::string& host, const SoapMessage& message) const;
    void begin(const std::string& url, const SoapMessage& message, Clock::time_point end, Answered answered);
    void readClock(Clock::time_point end, std::function<void()> then);
    void clockRead();
    void send(Exchange& exchange);
    void fill(const Exchange& exchange) const;
    void finish(Exchange& exchange, std::string failure);
    bool redirected(Exchange& exchange);
    static Answer answerOf(const Exchange& exchange);

    GMainContext* const m_context;
    const SteeringTarget m_target;
    std::chrono::system_clock::duration m_ahead{};    ///< the device's clock from ours
    Clock::time_point m_nextClock{};                  ///< when it may be read again
    Clock::time_point m_clockEnd{};                   ///< when the reading is given up
    std::vector<std::function<void()>> m_awaitsClock; ///< while it is being read
    std::unique_ptr<SoupSession, Release> m_session;
    std::list<std::unique_ptr<Exchange>> m_exchanges;
};

} // namespace qivo::runtime

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
/// Thread: one, which iterates the context.
class SoapClient {
  public:
    /// Redirections that are followed.
    static constexpr int kMostRedirections = 2;

    /// What came of a message.
    struct Answer {
        unsigned status = 0;            ///< of HTTP; 0 if no answer came
        std::optional<SoapReply> reply; ///< what could be read, a fault too
        std::string failure;            ///< for the log; empty if the device did what it was asked
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

    /// The difference of the device's clock from ours.
    void setClockDifference(std::chrono::system_clock::duration ahead) { m_ahead = ahead; }

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

    std::string headerFor(const std::string& host, const SoapMessage& message) const;
    void send(Exchange& exchange);
    void finish(Exchange& exchange, std::string failure);
    bool redirected(Exchange& exchange);
    static Answer answerOf(const Exchange& exchange);

    GMainContext* const m_context;
    const SteeringTarget m_target;
    std::chrono::system_clock::duration m_ahead{};
    std::unique_ptr<SoupSession, Release> m_session;
    std::list<std::unique_ptr<Exchange>> m_exchanges;
};

} // namespace qivo::runtime

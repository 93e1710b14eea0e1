#include "runtime/SoapClient.h"

#include "runtime/GstHandles.h"
#include "runtime/OnvifLogin.h"
#include "runtime/OnvifMessages.h"
#include "runtime/OnvifReplies.h"

#include <algorithm>
#include <array>
#include <libsoup/soup.h>
#include <utility>

namespace qivo::runtime {
namespace {

/// Enough for a stop while everything before it hangs.
constexpr int kConnections = 16;

struct Unref {
    void operator()(gpointer object) const { g_object_unref(object); }
};
struct FreeUri {
    void operator()(GUri* uri) const { g_uri_unref(uri); }
};
struct FreeBytes {
    void operator()(GBytes* bytes) const { g_bytes_unref(bytes); }
};
struct FreeSource {
    void operator()(GSource* source) const {
        g_source_destroy(source);
        g_source_unref(source);
    }
};
struct FreeTime {
    void operator()(GDateTime* time) const { g_date_time_unref(time); }
};

template <typename T>
using Owned = std::unique_ptr<T, Unref>;
using OwnedError = GstOwned<GError>;

std::string reasonOf(const OwnedError& error) {
    return error ? error->message : "no reason given";
}

std::string hostOf(const std::string& url) {
    const auto parts = urlParts(url);
    return parts ? parts->host : std::string();
}

bool isRedirection(unsigned status) {
    return status == SOUP_STATUS_MOVED_PERMANENTLY || status == SOUP_STATUS_FOUND ||
           status == SOUP_STATUS_TEMPORARY_REDIRECT || status == SOUP_STATUS_PERMANENT_REDIRECT;
}

std::optional<std::chrono::system_clock::time_point> dateOf(SoupMessageHeaders* headers) {
    const char* text = soup_message_headers_get_one(headers, "Date");
    const std::unique_ptr<GDateTime, FreeTime> date(text != nullptr ? soup_date_time_new_from_http_string(text)
                                                                    : nullptr);
    return date ? std::optional(std::chrono::system_clock::from_time_t(g_date_time_to_unix(date.get()))) : std::nullopt;
}

/// Devices say so by HTTP, by a fault, or by both; some call everything a bad request.
bool refusesLogin(const SoapClient::Answer& answer) {
    return answer.status == SOUP_STATUS_BAD_REQUEST || answer.status == SOUP_STATUS_UNAUTHORIZED ||
           answer.status == SOUP_STATUS_FORBIDDEN || (answer.reply && answer.reply->refusesLogin());
}

SoupSession* newSession() {
    SoupSession* session = soup_session_new_with_options("max-conns", kConnections, "max-conns-per-host", kConnections,
                                                         "proxy-resolver", nullptr, "timeout", 30U, nullptr);
    soup_session_remove_feature_by_type(session, SOUP_TYPE_AUTH_BASIC);
    soup_session_remove_feature_by_type(session, SOUP_TYPE_CONTENT_DECODER);
    return session;
}

} // namespace

struct SoapClient::Exchange {
    SoapClient* client = nullptr;
    std::string url;
    SoapMessage soap;
    Answered answered;
    int redirections = 0;
    bool late = false;
    Owned<SoupMessage> message;
    Owned<GInputStream> stream;
    const Owned<GCancellable> cancel{g_cancellable_new()};
    std::unique_ptr<GSource, FreeSource> limit;
    std::array<char, 16384> buffer{};
    std::string body;
};

/// What the libraries call. Each exchange lives until its last callback.
struct SoapClient::Callbacks {
    static gboolean late(gpointer data) {
        auto& exchange = *static_cast<Exchange*>(data);
        exchange.late = true;
        g_cancellable_cancel(exchange.cancel.get());
        return G_SOURCE_REMOVE;
    }

    static gboolean authenticate(SoupMessage*, SoupAuth* auth, gboolean retrying, gpointer data) {
        const Exchange& exchange = *static_cast<Exchange*>(data);
        const SteeringTarget& target = exchange.client->m_target;
        if (retrying != FALSE || !target.login || !sameHost(hostOf(exchange.url), target.loginHost)) {
            return FALSE;
        }
        soup_auth_authenticate(auth, target.login->user.c_str(), target.login->password.c_str());
        return TRUE;
    }

    static gboolean acceptCertificate(SoupMessage*, GTlsCertificate*, GTlsCertificateFlags, gpointer) { return TRUE; }

    static void restarted(SoupMessage*, gpointer data) {
        const auto& exchange = *static_cast<Exchange*>(data);
        exchange.client->fill(exchange);
    }

    static void sent(GObject* session, GAsyncResult* result, gpointer data) {
        auto& exchange = *static_cast<Exchange*>(data);
        GError* raw = nullptr;
        exchange.stream.reset(soup_session_send_finish(SOUP_SESSION(session), result, &raw));
        const OwnedError error(raw);
        if (!exchange.stream) {
            exchange.client->finish(exchange, reasonOf(error));
        } else if (!exchange.client->redirected(exchange)) {
            readMore(exchange);
        }
    }

    static void readMore(Exchange& exchange) {
        g_input_stream_read_async(exchange.stream.get(), exchange.buffer.data(), exchange.buffer.size(),
                                  G_PRIORITY_DEFAULT, exchange.cancel.get(), read, &exchange);
    }

    static void read(GObject* stream, GAsyncResult* result, gpointer data) {
        auto& exchange = *static_cast<Exchange*>(data);
        GError* raw = nullptr;
        const gssize length = g_input_stream_read_finish(G_INPUT_STREAM(stream), result, &raw);
        const OwnedError error(raw);
        if (length < 0) {
            exchange.client->finish(exchange, reasonOf(error));
            return;
        }
        exchange.body.append(exchange.buffer.data(), static_cast<std::size_t>(length));
        if (exchange.body.size() > kLargestReply) {
            g_cancellable_cancel(exchange.cancel.get());
            exchange.client->finish(exchange, "the answer is too large");
        } else if (length == 0) {
            exchange.client->finish(exchange, {});
        } else {
            readMore(exchange);
        }
    }
};

void SoapClient::Release::operator()(SoupSession* session) const {
    soup_session_abort(session);
    g_object_unref(session);
}

SoapClient::SoapClient(GMainContext* context, SteeringTarget target)
    : m_context(context), m_target(std::move(target)), m_session(newSession()) {}

SoapClient::~SoapClient() {
    for (const auto& exchange : m_exchanges) {
        exchange->answered = [](const Answer&) {};
        g_cancellable_cancel(exchange->cancel.get());
    }
    while (!m_exchanges.empty()) {
        g_main_context_iteration(m_context, TRUE);
    }
}

void SoapClient::takeClock(const Answer& answer) {
    auto clock = answer.reply ? onvif::clockOf(*answer.reply) : std::nullopt;
    clock = clock ? clock : answer.date;
    if (clock) {
        m_ahead = *clock - std::chrono::system_clock::now();
    }
}

bool SoapClient::mayLogIn(const std::string& host, const SoapMessage& message) const {
    return !message.open && m_target.login && sameHost(host, m_target.loginHost);
}

std::string SoapClient::headerFor(const std::string& host, const SoapMessage& message) const {
    if (!mayLogIn(host, message)) {
        return {};
    }
    return securityHeader(*m_target.login, newNonce(), std::chrono::system_clock::now() + m_ahead);
}

void SoapClient::post(const std::string& url, const SoapMessage& message, std::chrono::milliseconds limit,
                      Answered answered) {
    const Clock::time_point end = Clock::now() + limit;
    if (!mayLogIn(hostOf(url), message)) {
        begin(url, message, end, std::move(answered));
        return;
    }
    begin(url, message, end, [=, this, ahead = m_ahead](Answer answer) {
        if (!answer.refusesLogin) {
            answered(std::move(answer));
            return;
        }
        readClock(end, [=, this, refusal = std::make_shared<Answer>(std::move(answer))] {
            if (std::chrono::abs(m_ahead - ahead) >= kClockStep && Clock::now() < end) {
                begin(url, message, end, answered);
            } else {
                answered(std::move(*refusal));
            }
        });
    });
}

/// Calls `then` when the clock has been read, at `end` at the latest; at once where it was read a moment ago, or where
/// a reading under way may take longer than that.
void SoapClient::readClock(Clock::time_point end, std::function<void()> then) {
    const Clock::time_point now = Clock::now();
    if (m_awaitsClock.empty() ? now < m_nextClock : end < m_clockEnd) {
        then();
        return;
    }
    m_awaitsClock.push_back(std::move(then));
    if (m_awaitsClock.size() == 1) {
        m_nextClock = now + kClockPause;
        m_clockEnd = std::min(end, now + kClockLimit);
        begin(m_target.device, onvif::getSystemDateAndTime(), m_clockEnd, [this](const Answer& answer) {
            takeClock(answer);
            clockRead();
        });
    }
}

void SoapClient::clockRead() {
    for (const auto& then : std::exchange(m_awaitsClock, {})) {
        then();
    }
}

void SoapClient::begin(const std::string& url, const SoapMessage& message, Clock::time_point end, Answered answered) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - std::min(end, Clock::now()));
    m_exchanges.push_back(std::make_unique<Exchange>());
    Exchange& exchange = *m_exchanges.back();
    exchange.client = this;
    exchange.url = url;
    exchange.soap = message;
    exchange.answered = std::move(answered);
    exchange.limit.reset(g_timeout_source_new(static_cast<guint>(left.count())));
    g_source_set_callback(exchange.limit.get(), Callbacks::late, &exchange, nullptr);
    g_source_attach(exchange.limit.get(), m_context);
    send(exchange);
}

void SoapClient::send(Exchange& exchange) {
    exchange.message.reset(urlParts(exchange.url) ? soup_message_new(SOUP_METHOD_POST, exchange.url.c_str()) : nullptr);
    if (!exchange.message || !m_target.admits(exchange.url)) {
        finish(exchange, "the address " + exchange.url + " is not on a host that may be asked");
        return;
    }
    SoupMessage* message = exchange.message.get();
    fill(exchange);
    soup_message_add_flags(message, SOUP_MESSAGE_NO_REDIRECT);
    g_signal_connect(message, "authenticate", G_CALLBACK(Callbacks::authenticate), &exchange);
    g_signal_connect(message, "accept-certificate", G_CALLBACK(Callbacks::acceptCertificate), nullptr);
    g_signal_connect(message, "restarted", G_CALLBACK(Callbacks::restarted), &exchange);
    soup_session_send_async(m_session.get(), message, G_PRIORITY_DEFAULT, exchange.cancel.get(), Callbacks::sent,
                            &exchange);
}

/// Gives the message its document. To be done anew when it is sent once more with a login: the library does not keep
/// the document, and a nonce is used only once.
void SoapClient::fill(const Exchange& exchange) const {
    const std::string text = envelope(exchange.soap, headerFor(hostOf(exchange.url), exchange.soap));
    const std::unique_ptr<GBytes, FreeBytes> bytes(g_bytes_new(text.data(), text.size()));
    const std::string type = "application/soap+xml; charset=utf-8; action=\"" + exchange.soap.action + "\"";
    soup_message_set_request_body_from_bytes(exchange.message.get(), type.c_str(), bytes.get());
}

/// Asks again at the place that the device points to, if it is on the same host.
bool SoapClient::redirected(Exchange& exchange) {
    SoupMessage* message = exchange.message.get();
    const char* location = soup_message_headers_get_one(soup_message_get_response_headers(message), "Location");
    if (!isRedirection(soup_message_get_status(message)) || location == nullptr ||
        exchange.redirections == kMostRedirections) {
        return false;
    }
    const std::unique_ptr<GUri, FreeUri> uri(g_uri_parse_relative(
        soup_message_get_uri(message), location, static_cast<GUriFlags>(SOUP_HTTP_URI_FLAGS), nullptr));
    const GstOwned<gchar> address(uri ? g_uri_to_string(uri.get()) : nullptr);
    const auto from = urlParts(exchange.url);
    const auto to = address ? urlParts(address.get()) : std::nullopt;
    if (!from || !to || !sameHost(from->host, to->host)) {
        return false;
    }
    ++exchange.redirections;
    exchange.url = urlOf(*to);
    exchange.stream.reset();
    send(exchange);
    return true;
}

SoapClient::Answer SoapClient::answerOf(const Exchange& exchange) {
    Answer answer;
    answer.status = exchange.message ? soup_message_get_status(exchange.message.get()) : 0;
    if (answer.status == 0) {
        answer.failure = "no answer";
        return answer;
    }
    answer.date = dateOf(soup_message_get_response_headers(exchange.message.get()));
    answer.reply = SoapReply::parse(exchange.body);
    const bool blank = exchange.body.find_first_not_of(" \t\r\n") == std::string::npos;
    answer.refusesLogin = refusesLogin(answer);
    if (answer.reply && answer.reply->isFault()) {
        answer.failure = "it refuses: " + answer.reply->reason();
    } else if (answer.status >= 300) {
        answer.failure = "HTTP status " + std::to_string(answer.status);
    } else if (!answer.reply && !blank) {
        answer.failure = "the answer cannot be read";
    }
    return answer;
}

/// The exchange ends with this.
void SoapClient::finish(Exchange& exchange, std::string failure) {
    const auto it =
        std::find_if(m_exchanges.begin(), m_exchanges.end(), [&](const auto& one) { return one.get() == &exchange; });
    const std::unique_ptr<Exchange> ended = std::move(*it);
    m_exchanges.erase(it);
    if (ended->message) {
        g_signal_handlers_disconnect_by_data(ended->message.get(), ended.get());
    }
    Answer answer = failure.empty() ? answerOf(*ended) : Answer{};
    if (!failure.empty()) {
        answer.failure = ended->late ? "no answer in time" : std::move(failure);
    }
    ended->answered(std::move(answer));
}

SoapClient::Answer SoapClient::ask(const std::string& url, const SoapMessage& message, std::chrono::milliseconds limit,
                                   const std::function<bool()>& ended) {
    auto answer = std::make_shared<std::optional<Answer>>();
    post(url, message, limit, [answer](Answer came) { *answer = std::move(came); });
    while (!*answer && !ended()) {
        g_main_context_iteration(m_context, TRUE);
    }
    if (!*answer) {
        *answer = Answer{};
        (*answer)->failure = "given up";
    }
    return std::move(**answer);
}

} // namespace qivo::runtime

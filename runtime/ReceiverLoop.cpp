#include "runtime/ReceiverLoop.h"

#include "runtime/BackgroundThreads.h"
#include "runtime/Log.h"

#include <algorithm>
#include <utility>

namespace qivo::runtime {
namespace {

RtspSession::Failure broken(std::string reason) {
    return {RtspSession::Failure::Kind::broken, std::move(reason)};
}

/// The page of the machine that the address is on.
std::string pageOf(const std::string& address) {
    auto parts = urlParts(address);
    if (parts) {
        parts->path.assign(1, '/');
    }
    return parts ? urlOf(*parts) : std::string();
}

ReceiverLoop::Clock::duration stallLimit(const RtspSession& session) {
    return std::max<ReceiverLoop::Clock::duration>(session.paceKnown() ? kStallLimit : kFirstStallLimit,
                                                   kStallIntervals * session.unitInterval());
}

} // namespace

ReceiverLoop::ReceiverLoop(Request request, Receiver::Environment environment)
    : m_request(std::move(request)), m_environment(std::move(environment)) {}

void ReceiverLoop::stop() {
    m_stopped = true;
    m_mailbox->close();
    m_wakeup->notify();
    const std::lock_guard guard(m_mutex);
    endSteering();
}

/// With the lock held.
void ReceiverLoop::endSteering() {
    for (auto* steering : {&m_steering, &m_successor}) {
        if (*steering) {
            (*steering)->end();
        }
    }
}

std::string ReceiverLoop::webControl() const {
    const std::lock_guard guard(m_mutex);
    return m_web.empty() && m_steering && m_steering->isSupported() ? pageOf(m_steering->target().device) : m_web;
}

std::shared_ptr<Steering> ReceiverLoop::steering() const {
    const std::lock_guard guard(m_mutex);
    return m_steering && m_steering->isSupported() ? m_steering : nullptr;
}

void ReceiverLoop::run() {
    m_view = m_environment.view ? m_environment.view() : nullptr;
    std::shared_ptr<void> subscription;
    if (m_view) {
        subscription = m_view->subscribe([this] {
            m_announcementsChanged = true;
            m_wakeup->notify();
        });
    }
    while (!m_stopped) {
        refreshAnnouncement();
        const std::string url = target(m_first);
        if (url.empty() || Clock::now() < m_nextAttempt) {
            pause();
            continue;
        }
        const bool tcp = std::exchange(m_nextTcp, false) || m_environment.transports->needsTcp(sourceKey(url));
        if (std::exchange(m_attempted, url) != url) {
            m_patience = 0;
        }
        m_first = false;
        m_hurry = false;
        m_backoff.attemptBegan(Clock::now());
        const Outcome outcome = attempt(url, tcp);
        if (!m_stopped) {
            settle(outcome, url, tcp);
        }
    }
    subscription.reset();
    m_mailbox->drain();
}

/// Looks at the announcement again if any has changed; tells the caller of a new web or device address.
void ReceiverLoop::refreshAnnouncement() {
    if (!m_view || !m_announcementsChanged.exchange(false)) {
        return;
    }
    auto found = announcementOf(m_request, *m_view);
    // A source that is gone keeps what it said: it may only be rebooting.
    if (!found || found == m_announcement) {
        return;
    }
    m_announcement = std::move(found);
    m_hurry = true;
    bool told = false;
    {
        const std::lock_guard guard(m_mutex);
        const std::string web = isWebAddress(m_announcement->web) ? m_announcement->web : "";
        const std::string onvif = isWebAddress(m_announcement->onvif) ? m_announcement->onvif : "";
        told = std::exchange(m_web, web) != web;
        told = std::exchange(m_onvif, onvif) != onvif || told;
    }
    if (told) {
        m_mailbox->raiseStatus();
    }
    steer();
}

/// Looks for the camera behind the source, anew where the announcement leads elsewhere or where none was found. The
/// sound of a source is received beside its picture, which is enough to steer by.
///
/// `anew`: the device may have restarted, and what was asked once may be out of date. It is asked again beside what
/// steers it meanwhile.
void ReceiverLoop::steer(bool anew) {
    if (m_request.bandwidth == QIVOlib_recv_bandwidth_audio_only) {
        return;
    }
    auto target = steeringTarget(m_request, m_announcement, m_shown);
    const std::lock_guard guard(m_mutex);
    if (m_stopped) {
        return;
    }
    if (target && m_steering && !m_steering->isOver() && m_steering->target() == *target) {
        if (anew && m_steering->isSupported()) {
            if (m_successor) {
                m_successor->end(); // what it was told before this restart is out of date, too
            }
            m_successor = Steering::start(std::move(*target), [wakeup = m_wakeup] { wakeup->notify(); });
        }
        return;
    }
    endSteering();
    m_steering.reset();
    m_successor.reset();
    if (target) {
        m_steering = Steering::start(std::move(*target), [mailbox = m_mailbox] { mailbox->raiseStatus(); });
    }
}

/// Lets the successor steer once it has its answers. The end of the other one stops a camera that moves, so that it
/// waits for one that is the same as before to stand. One that has changed understands the other one no more.
void ReceiverLoop::succeed() {
    const std::lock_guard guard(m_mutex);
    const bool isReady = m_successor && m_successor->isSupported();
    if (!isReady || (m_steering->isBusy() && m_steering->knowsTheSame(*m_successor))) {
        return;
    }
    m_steering->end();
    m_steering = std::exchange(m_successor, nullptr);
}

std::string ReceiverLoop::target(bool first) const {
    return targetUrl(m_request, m_announcement, first);
}

void ReceiverLoop::pause() {
    const std::uint64_t seen = m_wakeup->count();
    succeed();
    if (m_stopped || m_announcementsChanged) {
        return;
    }
    if (m_hurry && !m_first) {
        m_nextAttempt = std::min(m_nextAttempt, m_backoff.hurry());
    }
    const bool nowhere = target(m_first).empty();
    m_wakeup->wait(seen, nowhere ? Clock::time_point::max() : m_nextAttempt);
}

ReceiverLoop::Outcome ReceiverLoop::attempt(const std::string& url, bool tcp) {
    const Media media = m_request.bandwidth == QIVOlib_recv_bandwidth_audio_only ? Media::audio : Media::video;
    const auto stepLimit = std::chrono::duration_cast<std::chrono::milliseconds>(patient(kStepLimit));
    const Clock::time_point began = Clock::now();
    auto session =
        std::make_shared<RtspSession>(RtspSession::Settings{url, media, tcp, stepLimit}, m_mailbox, m_wakeup);
    Outcome outcome = watch(*session, url, tcp);
    outcome.described = session->described();
    outcome.slow =
        outcome.silent || (session->asked() && !session->playingSince() && Clock::now() - began >= stepLimit);
    end(std::move(session));
    m_mailbox->dropWaiting();
    return outcome;
}

ReceiverLoop::Outcome ReceiverLoop::watch(const RtspSession& session, const std::string& url, bool tcp) {
    const Clock::time_point began = Clock::now();
    bool connected = false;
    while (!m_stopped) {
        const std::uint64_t seen = m_wakeup->count();
        refreshAnnouncement();
        succeed();
        if (const auto lastPacket = session.lastPacket(); !connected && lastPacket) {
            connected = true;
            m_reported.clear();
            if (tcp) {
                m_environment.transports->remember(sourceKey(url));
            }
            const Clock::time_point playing = session.playingSince().value_or(*lastPacket);
            if (playing - began < kStepLimit && *lastPacket - playing < kTcpLimit) {
                m_patience = 0;
            }
            steer(std::exchange(m_shown, true));
        }
        if (auto outcome = judge(session, began, url, tcp)) {
            return *outcome;
        }
        m_wakeup->wait(seen, nextLook(session, began, tcp));
    }
    return {};
}

/// Takes the connection apart beside the loop, and normally waits for that.
void ReceiverLoop::end(std::shared_ptr<RtspSession> session) {
    session->mute();
    ++*m_ending;
    std::function<void()> work = [session = std::move(session), ending = m_ending, wakeup = m_wakeup]() mutable {
        session.reset();
        --*ending;
        wakeup->notify();
    };
    if (!BackgroundThreads::start(work)) {
        work();
    }
    work = nullptr;
    const Clock::time_point limit = Clock::now() + kEndingLimit;
    while (!m_stopped && *m_ending > 0 && (Clock::now() < limit || *m_ending >= kMostEnding)) {
        const std::uint64_t seen = m_wakeup->count();
        if (*m_ending > 0) {
            m_wakeup->wait(seen, *m_ending >= kMostEnding ? Clock::time_point::max() : limit);
        }
    }
}

/// What has come of an attempt; empty while it goes on.
std::optional<ReceiverLoop::Outcome> ReceiverLoop::judge(const RtspSession& session, Clock::time_point began,
                                                         const std::string& url, bool tcp) const {
    const auto lastPacket = session.lastPacket();
    Outcome outcome;
    if (lastPacket) {
        outcome.connected = *lastPacket - began;
    }
    if (auto failure = session.failure()) {
        outcome.failure = *failure;
        return outcome;
    }
    if (!lastPacket) {
        if (target(false) != url && m_hurry) {
            outcome.failure = broken("announced at another address");
            outcome.superseded = true;
            return outcome;
        }
        return judgeSilence(session, began, tcp);
    }
    if (Clock::now() - *lastPacket >= stallLimit(session)) {
        outcome.failure = broken("nothing comes any more");
        return outcome;
    }
    return std::nullopt;
}

/// A source that says that it is slow is given its time; elsewhere UDP that brings nothing is thought to be blocked.
ReceiverLoop::Clock::duration ReceiverLoop::firstPacketLimit(const RtspSession& session, bool tcp) const {
    return std::max<Clock::duration>(tcp ? patient(kTcpLimit) : Clock::duration(kUdpLimit),
                                     kStallIntervals * session.unitInterval());
}

std::optional<ReceiverLoop::Outcome> ReceiverLoop::judgeSilence(const RtspSession& session, Clock::time_point began,
                                                                bool tcp) const {
    const Clock::time_point now = Clock::now();
    Outcome outcome;
    if (const auto playing = session.playingSince()) {
        if (now - *playing < firstPacketLimit(session, tcp)) {
            return std::nullopt;
        }
        outcome.failure = broken("the server agreed to send, but nothing came");
        outcome.silent = true;
        return outcome;
    }
    if (now - began < patient(kHandshakeLimit)) {
        return std::nullopt;
    }
    outcome.failure = broken("the server took too long to agree");
    return outcome;
}

/// When time alone can change the judgement, or earlier.
ReceiverLoop::Clock::time_point ReceiverLoop::nextLook(const RtspSession& session, Clock::time_point began,
                                                       bool tcp) const {
    if (const auto lastPacket = session.lastPacket()) {
        // The limit may become shorter meanwhile.
        return std::min<Clock::time_point>(*lastPacket + stallLimit(session), Clock::now() + kStallLimit);
    }
    if (const auto playing = session.playingSince()) {
        return *playing + firstPacketLimit(session, tcp);
    }
    return began + patient(kHandshakeLimit);
}

/// Decides when and how to try again.
void ReceiverLoop::settle(const Outcome& outcome, const std::string& url, bool tcp) {
    report(outcome, url);
    const Clock::time_point next = m_backoff.attemptEnded(outcome.connected);
    if (outcome.slow && (tcp || !outcome.silent)) {
        m_patience = std::min(m_patience + 1, kMostPatience);
    }
    // Another receiver may take a stream over TCP that this one has no use for.
    if (tcp && outcome.described && outcome.connected == Clock::duration{} &&
        outcome.failure.kind != RtspSession::Failure::Kind::noStream) {
        m_environment.transports->forget(sourceKey(url));
    }
    if (outcome.silent && !tcp) {
        m_nextTcp = true;
        m_nextAttempt = Clock::now();
    } else if (outcome.failure.kind == RtspSession::Failure::Kind::noTransport && !tcp) {
        m_environment.transports->remember(sourceKey(url));
        m_nextAttempt = next;
    } else if (outcome.failure.kind == RtspSession::Failure::Kind::noStream) {
        m_nextAttempt = Clock::now() + kNoStreamPause;
    } else {
        m_nextAttempt = next;
    }
}

/// One line for each new reason, so that a source that is away for days does not fill the log.
void ReceiverLoop::report(const Outcome& outcome, const std::string& url) {
    std::string text = sourceKey(url) + ": " + outcome.failure.reason;
    if (text != m_reported) {
        log(text);
        m_reported = std::move(text);
    }
}

} // namespace qivo::runtime

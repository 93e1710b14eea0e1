#pragma once

#include <QString>

#include <memory>

namespace qivo {

/// Keeps the system from throttling the application, from idling and from going to sleep, for as long as it lives. It
/// asks the desktop portal, or where there is none the screen saver, and the login manager, over D-Bus; whatever is
/// absent or refuses is passed over in silence.
///
/// Beginning never waits: the services are asked on a thread of the activity's own. Ending waits until they were told,
/// at most kEndTimeoutMs, and for the thread, which holds nothing that could block; so nothing of an activity is left
/// when the process ends, however a bus behaves.
///
/// Thread: any.
class Activity {
  public:
    /// A service that has not answered by then counts as absent.
    static constexpr int kCallTimeoutMs = 5000;
    static constexpr int kEndTimeoutMs = 500;

    /// The reason is shown to the user by the system's tools.
    explicit Activity(const QString& reason);
    ~Activity();
    Activity(const Activity&) = delete;
    Activity& operator=(const Activity&) = delete;

  private:
    class Conversation;
    std::unique_ptr<Conversation> m_conversation;
};

} // namespace qivo

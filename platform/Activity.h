#pragma once

#include <QString>

#include <memory>

namespace qivo {

/// Keeps the system from throttling the application, from idling and from going to sleep, for as long as it lives. It
/// asks the desktop portal, or where there is none the screen saver, and the login manager, over D-Bus; whatever is
/// absent or refuses is passed over in silence.
///
/// Beginning never waits: the services are asked on a thread of the activity's own. Ending waits until they were told,
/// at most kEndTimeoutMs.
///
/// Thread: any.
class Activity {
  public:
    static constexpr int kCallTimeoutMs = 5000;
    static constexpr int kEndTimeoutMs = 500;

    /// The reason is shown to the user by the system's tools.
    explicit Activity(const QString& reason);
    ~Activity();
    Activity(const Activity&) = delete;
    Activity& operator=(const Activity&) = delete;

  private:
    struct State;
    std::shared_ptr<State> m_state; // shared with the thread, which may outlive a bus that does not answer
};

} // namespace qivo

#pragma once

#include <QObject>

namespace qivo {

/// Turns the signals that ask a process to end (SIGTERM, SIGINT, SIGHUP) into a Qt signal on the thread of this object,
/// so that the application ends in its usual order. Afterwards, a signal ends the process as it always would.
///
/// The usual order may wait for something that never comes, such as a recorder that stays silent. So a signal that
/// comes kPatienceMs or more after the first ends the process at once. Sooner it does not: a terminal that closes, or a
/// session's end, often sends several.
///
/// One object at a time.
class TerminationSignals : public QObject {
    Q_OBJECT

  public:
    static constexpr int kPatienceMs = 1000;

    explicit TerminationSignals(QObject* parent = nullptr);
    ~TerminationSignals() override;

  signals:
    void received(int signal);

  private:
    void read();
};

} // namespace qivo

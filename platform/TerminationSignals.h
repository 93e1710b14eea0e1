#pragma once

#include <QObject>

namespace qivo {

/// Turns the signals that ask a process to end (SIGTERM, SIGINT, SIGHUP) into a Qt signal on the thread of this object,
/// so that the application ends in its usual order. Afterwards, a signal ends the process as it always would.
///
/// One object at a time.
class TerminationSignals : public QObject {
    Q_OBJECT

  public:
    explicit TerminationSignals(QObject* parent = nullptr);
    ~TerminationSignals() override;

  signals:
    void received(int signal);

  private:
    void read();
};

} // namespace qivo

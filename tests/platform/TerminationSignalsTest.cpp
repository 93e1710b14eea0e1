#include "platform/TerminationSignals.h"

#include <QCoreApplication>
#include <QTimer>

#include <chrono>
#include <csignal>
#include <gmock/gmock.h>
#include <thread>
#include <vector>

namespace qivo {
namespace {

class TerminationSignalsTest : public testing::TestWithParam<int> {
  protected:
    int count = 1;
    char name[5] = "test";                // NOLINT(modernize-avoid-c-arrays): argv is an array
    char* arguments[2] = {name, nullptr}; // NOLINT(modernize-avoid-c-arrays)
    QCoreApplication application{count, arguments};
};

TEST_P(TerminationSignalsTest, ArrivesInTheEventLoopAndCanEndIt) {
    const TerminationSignals signalsToEnd;
    std::vector<int> received;
    QObject::connect(&signalsToEnd, &TerminationSignals::received, &application, [&](int signal) {
        received.push_back(signal);
        QCoreApplication::quit();
    });
    QTimer::singleShot(20000, &application, [] { QCoreApplication::exit(1); });
    QTimer::singleShot(0, &application, [] { raise(GetParam()); });
    EXPECT_EQ(QCoreApplication::exec(), 0);
    EXPECT_THAT(received, testing::ElementsAre(GetParam()));
}

TEST_P(TerminationSignalsTest, EndsTheProcessAsUsualOnceTheObjectIsGone) {
    { const TerminationSignals signalsToEnd; }
    EXPECT_EXIT(raise(GetParam()), testing::KilledBySignal(GetParam()), "");
}

TEST_P(TerminationSignalsTest, SecondOneEndsAProcessThatDoesNotComeToAnEnd) {
    const auto hang = [] {
        const TerminationSignals signalsToEnd;
        raise(SIGTERM);
        std::this_thread::sleep_for(std::chrono::milliseconds(TerminationSignals::kPatienceMs + 10));
        raise(GetParam());
    };
    EXPECT_EXIT(hang(), testing::KilledBySignal(GetParam()), "");
}

TEST_P(TerminationSignalsTest, SeveralAtOnceAreOneRequest) {
    const TerminationSignals signalsToEnd;
    std::vector<int> received;
    QObject::connect(&signalsToEnd, &TerminationSignals::received, &application,
                     [&](int signal) { received.push_back(signal); });
    raise(GetParam());
    raise(SIGHUP);
    QCoreApplication::processEvents();
    EXPECT_THAT(received, testing::ElementsAre(GetParam(), SIGHUP));
}

INSTANTIATE_TEST_SUITE_P(All, TerminationSignalsTest, testing::Values(SIGTERM, SIGINT, SIGHUP));

} // namespace
} // namespace qivo

// The model and the sources menu: what a pair read costs beside a lock that nobody else wants, and what a refresh of
// the menu costs when nothing, or everything, has changed. The ratios at the end are of the same run.

#include "app/AppData.h"
#include "discovery/QIVOFileMenu.h"
#include "discovery/SourceTree.h"
#include "tests/fake/FakeQivo.h"

#include <QApplication>

#include <benchmark/benchmark.h>
#include <cstdio>
#include <map>
#include <mutex>
#include <string>
#include <vector>

namespace {

using namespace qivo;

constexpr int kManySources = 10000;
constexpr int kSourcesPerMachine = 8;

std::vector<test::FakeQivo::Source> manySources() {
    std::vector<test::FakeQivo::Source> sources;
    for (int i = 0; i < kManySources; ++i) {
        sources.push_back({"MACHINE " + std::to_string(i / kSourcesPerMachine) + " (Camera " + std::to_string(i) + ")",
                           "rtsp://10.0.0.1:8554/" + std::to_string(i)});
    }
    return sources;
}

AppData& model() {
    static AppData data(std::make_unique<Preferences>(QStringLiteral("/nonexistent/preferences")));
    return data;
}

void lockAndUnlock(benchmark::State& state) {
    std::mutex mutex;
    for (auto _ : state) {
        const std::lock_guard guard(mutex);
        benchmark::ClobberMemory();
    }
}

/// What any reader of a pair does at least: take a lock and copy two strings.
void copyPairUnderMutex(benchmark::State& state) {
    std::mutex mutex;
    const QString name = QStringLiteral("STUDIO (Cam 1)");
    const QString url = QStringLiteral("rtsp://10.0.0.1:8554/1");
    for (auto _ : state) {
        QString named;
        QString located;
        {
            const std::lock_guard guard(mutex);
            named = name;
            located = url;
        }
        benchmark::DoNotOptimize(named);
        benchmark::DoNotOptimize(located);
    }
}

void readPair(benchmark::State& state) {
    model().setQIVOSourceInfoNamed(QStringLiteral("STUDIO (Cam 1)"), QStringLiteral("rtsp://10.0.0.1:8554/1"));
    for (auto _ : state) {
        QString named;
        QString located;
        model().getQIVOSourceInfoNamed(named, located);
        benchmark::DoNotOptimize(named);
        benchmark::DoNotOptimize(located);
    }
}

void readCounter(benchmark::State& state) {
    for (auto _ : state) {
        benchmark::DoNotOptimize(model().selectedQIVOSourceChangedCount());
    }
}

void refreshWithoutChange(benchmark::State& state) {
    test::FakeQivo::instance().reset();
    QIVOFileMenu menu;
    test::FakeQivo::instance().setSources(manySources());
    menu.updateMenu();
    for (auto _ : state) {
        menu.updateMenu();
    }
    test::FakeQivo::instance().takeCalls();
}

void rebuildManySources(benchmark::State& state) {
    test::FakeQivo::instance().reset();
    QIVOFileMenu menu;
    const auto sources = manySources();
    for (auto _ : state) {
        state.PauseTiming();
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        test::FakeQivo::instance().setSources(sources);
        state.ResumeTiming();
        menu.updateMenu();
    }
}

void treeOfManySources(benchmark::State& state) {
    const auto sources = manySources();
    for (auto _ : state) {
        SourceTree tree;
        for (const auto& source : sources) {
            tree.addName(*source.name);
        }
        benchmark::DoNotOptimize(tree);
    }
}

BENCHMARK(lockAndUnlock);
BENCHMARK(copyPairUnderMutex);
BENCHMARK(readPair);
BENCHMARK(readCounter);
BENCHMARK(refreshWithoutChange);
BENCHMARK(rebuildManySources)->Unit(benchmark::kMillisecond);
BENCHMARK(treeOfManySources)->Unit(benchmark::kMillisecond);

/// Prints as usual and keeps the times, in nanoseconds, for the ratios.
class Reporter : public benchmark::ConsoleReporter {
  public:
    void ReportRuns(const std::vector<Run>& runs) override {
        ConsoleReporter::ReportRuns(runs);
        for (const Run& run : runs) {
            m_times[run.benchmark_name()] =
                run.GetAdjustedCPUTime() * 1e9 / benchmark::GetTimeUnitMultiplier(run.time_unit);
        }
    }

    void ratio(const char* of, const char* to) const {
        const auto top = m_times.find(of);
        const auto bottom = m_times.find(to);
        if (top != m_times.end() && bottom != m_times.end()) {
            std::printf("%s / %s = %.2f\n", of, to, top->second / bottom->second);
        }
    }

  private:
    std::map<std::string, double> m_times;
};

} // namespace

int main(int argc, char** argv) {
    qputenv("QT_QPA_PLATFORM", "offscreen");
    const QApplication application(argc, argv);
    benchmark::Initialize(&argc, argv);
    Reporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    reporter.ratio("readPair", "lockAndUnlock");
    reporter.ratio("readPair", "copyPairUnderMutex");
    reporter.ratio("rebuildManySources", "treeOfManySources");
    reporter.ratio("rebuildManySources", "refreshWithoutChange");
    return 0;
}

#include "platform/Log.h"

#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <regex>
#include <string>
#include <thread>
#include <unistd.h>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

TEST(Log, PassesARecordAsItWasWritten) {
    LogCapture log;
    logLine(">> MESSAGE[%d]: %s", -7, "text");
    EXPECT_THAT(log.take(), ElementsAre(">> MESSAGE[-7]: text"));
}

TEST(Log, KeepsNewlinesInOneRecord) {
    LogCapture log;
    logLine(">> ERROR: {\n%s\n}\n", "first\nsecond");
    EXPECT_THAT(log.take(), ElementsAre(">> ERROR: {\nfirst\nsecond\n}\n"));
}

TEST(Log, DoesNotCutLongRecords) {
    const std::string text(1 << 20, 'x');
    LogCapture log;
    logLine("<%s>", text.c_str());
    EXPECT_THAT(log.take(), ElementsAre("<" + text + ">"));
}

TEST(Log, GivesTheSinkBack) {
    LogCapture outer;
    {
        LogCapture inner;
        logLine("inner");
        EXPECT_THAT(inner.take(), ElementsAre("inner"));
    }
    EXPECT_THAT(outer.take(), IsEmpty());
    logLine("outer");
    EXPECT_THAT(outer.take(), ElementsAre("outer"));
}

TEST(Log, TakesRecordsOfSeveralThreads) {
    constexpr int perThread = 200;
    LogCapture log;
    std::array<std::thread, 4> threads;
    for (int number = 0; number < 4; ++number) {
        threads[static_cast<std::size_t>(number)] = std::thread([number] {
            for (int record = 0; record < perThread; ++record) {
                logLine("%d", number);
            }
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    const auto records = log.take();
    for (int number = 0; number < 4; ++number) {
        EXPECT_EQ(std::count(records.begin(), records.end(), std::to_string(number)), perThread);
    }
}

std::string systemLogOf(const char* text) {
    ::setenv("QT_FORCE_STDERR_LOGGING", "1", 1);
    ::unsetenv("QT_MESSAGE_PATTERN");
    testing::internal::CaptureStderr();
    logLine("%s", text);
    return testing::internal::GetCapturedStderr();
}

TEST(Log, SystemLogAddsTimeAndProcess) {
    const std::string line = systemLogOf(">> a \"text\" with 100 %s");
    const std::regex stamped("\\d{4}-\\d{2}-\\d{2} \\d{2}:\\d{2}:\\d{2}\\.\\d{3} [^\\n]*\\[" +
                             std::to_string(::getpid()) + "\\] >> a \"text\" with 100 %s\\n");
    EXPECT_TRUE(std::regex_match(line, stamped)) << line;
}

TEST(Log, SystemLogEndsARecordThatEndsWithANewlineWithAnEmptyLine) {
    const std::string lines = systemLogOf(">> ERROR: {\nlog\n}\n");
    EXPECT_THAT(lines, testing::EndsWith(">> ERROR: {\nlog\n}\n\n"));
}

} // namespace
} // namespace qivo

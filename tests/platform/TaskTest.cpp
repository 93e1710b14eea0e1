#include "platform/Task.h"

#include "platform/CancellableThread.h"
#include "tests/platform/TemporaryDirectory.h"

#include <chrono>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <thread>

namespace qivo {
namespace {

std::string allOutput(Task& task) {
    std::string all;
    for (std::string part = task.readOutput(); !part.empty(); part = task.readOutput()) {
        all += part;
    }
    return all;
}

bool ends(Task& task) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (task.isRunning() && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return !task.isRunning();
}

std::unique_ptr<Task> shell(const std::string& script) {
    return Task::launch("/bin/sh", {"-c", script});
}

bool isOpen(int descriptor) {
    return fcntl(descriptor, F_GETFD) >= 0;
}

/// Closes a standard stream for as long as it lives.
class WithoutStream {
  public:
    explicit WithoutStream(int number) : m_number(number), m_kept(fcntl(number, F_DUPFD_CLOEXEC, 3)) { close(number); }
    ~WithoutStream() {
        dup2(m_kept, m_number);
        close(m_kept);
    }
    WithoutStream(const WithoutStream&) = delete;
    WithoutStream& operator=(const WithoutStream&) = delete;

  private:
    int m_number;
    int m_kept;
};

TEST(TaskTest, OutputIsReadToItsEnd) {
    const auto task = shell("echo one; echo two");
    ASSERT_NE(task, nullptr);
    EXPECT_EQ(allOutput(*task), "one\ntwo\n");
    EXPECT_EQ(task->readOutput(), "");
    EXPECT_TRUE(ends(*task));
}

TEST(TaskTest, ArgumentsArriveAsTheyAre) {
    const auto task = Task::launch("/bin/sh", {"-c", "printf '<%s>' \"$@\"", "sh", "a b", "", "\"$x\"", "*"});
    ASSERT_NE(task, nullptr);
    EXPECT_EQ(allOutput(*task), "<a b><><\"$x\"><*>");
}

TEST(TaskTest, ProgramThatCannotBeStartedIsNoTask) {
    EXPECT_EQ(Task::launch("/nowhere", {}), nullptr);
    EXPECT_EQ(Task::launch("/", {}), nullptr);
    EXPECT_EQ(Task::launch("", {}), nullptr);
    EXPECT_EQ(Task::launch("sh", {}), nullptr) << "no search in PATH";
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1) << "no child is left";
}

TEST(TaskTest, OutputMayEndBeforeTheProgram) {
    const auto task = shell("exec >&-; read line");
    ASSERT_NE(task, nullptr);
    EXPECT_EQ(task->readOutput(), "");
    EXPECT_TRUE(task->isRunning());
    task->interrupt();
    EXPECT_TRUE(ends(*task));
    task->interrupt(); // the number is another program's by now, or nobody's
}

TEST(TaskTest, DestroyingItEndsTheInputAndWaits) {
    const TemporaryDirectory folder;
    const std::string seen = folder.path("end of input");
    auto task = shell("cat; sleep 0.1; : >'" + seen + "'");
    ASSERT_NE(task, nullptr);
    EXPECT_FALSE(std::filesystem::exists(seen));
    task.reset();
    EXPECT_TRUE(std::filesystem::exists(seen));
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
}

TEST(TaskTest, ProcessWithoutStandardStreamsCanStartOneAndPrintsNothingIntoIt) {
    std::string output;
    ssize_t printed = 0;
    {
        const WithoutStream noInput(STDIN_FILENO);
        const WithoutStream noOutput(STDOUT_FILENO);
        const auto task = shell("test -p /dev/stdin && test -p /dev/stdout && echo fine");
        printed = write(STDOUT_FILENO, "text", 4);
        output = task != nullptr ? allOutput(*task) : "not started";
    }
    EXPECT_EQ(output, "fine\n");
    EXPECT_EQ(printed, -1);
}

TEST(TaskTest, EndIsSeenAlsoWhereEndsOfChildrenAreIgnored) {
    const auto before = signal(SIGCHLD, SIG_IGN);
    const auto task = shell("exit 0");
    ASSERT_NE(task, nullptr);
    EXPECT_TRUE(ends(*task));
    signal(SIGCHLD, before);
}

TEST(FileDescriptorTest, IsClosedByItsLastOwner) {
    FileDescriptor first(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const int number = first.number();
    ASSERT_TRUE(isOpen(number));
    FileDescriptor second(std::move(first));
    EXPECT_FALSE(first.isOpen()); // NOLINT(bugprone-use-after-move): what a move leaves is promised
    EXPECT_EQ(first.number(), -1);
    EXPECT_TRUE(isOpen(number));
    FileDescriptor third(open("/dev/null", O_RDONLY | O_CLOEXEC));
    const int replaced = third.number();
    third = std::move(second);
    EXPECT_FALSE(isOpen(replaced));
    EXPECT_EQ(third.number(), number);
    FileDescriptor& itself = third;
    third = std::move(itself);
    EXPECT_TRUE(isOpen(number));
    third.reset();
    third.reset();
    EXPECT_FALSE(isOpen(number));
}

TEST(CancellableThreadTest, ExecutesUntilItsWorkIsDone) {
    std::atomic<bool> goOn = false;
    std::atomic<bool> cancelledEarly = false;
    CancellableThread thread([&](const std::stop_token& cancelled) {
        while (!goOn) {
            std::this_thread::yield();
        }
        cancelledEarly = cancelled.stop_requested();
        while (!cancelled.stop_requested()) {
            std::this_thread::yield();
        }
    });
    EXPECT_TRUE(thread.isExecuting());
    goOn = true;
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    EXPECT_TRUE(thread.isExecuting());
    thread.cancel();
    while (thread.isExecuting()) {
        std::this_thread::yield();
    }
    EXPECT_FALSE(cancelledEarly);
}

TEST(CancellableThreadTest, DestroyingItCancelsAndWaits) {
    std::atomic<bool> done = false;
    {
        const CancellableThread thread([&](const std::stop_token& cancelled) {
            while (!cancelled.stop_requested()) {
                std::this_thread::yield();
            }
            done = true;
        });
    }
    EXPECT_TRUE(done);
}

} // namespace
} // namespace qivo

#include "platform/Preferences.h"

#include "tests/platform/LogCapture.h"
#include "tests/platform/TemporaryDirectory.h"

#include <array>
#include <fstream>
#include <gmock/gmock.h>
#include <iterator>
#include <linux/capability.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

const QString kSwitch = QStringLiteral("switch");
const QString kFolder = QStringLiteral("folder");

std::string contentOf(const std::string& file) {
    std::ifstream stream(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), {}};
}

class PreferencesTest : public testing::Test {
  protected:
    Preferences open() const { return Preferences(QString::fromStdString(file)); }

    TemporaryDirectory directory;
    std::string file = directory.path("app.conf");
    LogCapture log;
};

TEST_F(PreferencesTest, AbsentFileHasNoValuesAndIsNoReasonForALogLine) {
    Preferences preferences = open();
    EXPECT_EQ(preferences.boolForKey(kSwitch), std::nullopt);
    EXPECT_EQ(preferences.stringForKey(kFolder), std::nullopt);
    EXPECT_THAT(log.take(), ElementsAre());
}

TEST_F(PreferencesTest, ValuesAreInTheFileAtOnce) {
    Preferences preferences = open();
    preferences.setBool(true, kSwitch);
    preferences.setString("/a b", kFolder);
    EXPECT_THAT(contentOf(file), HasSubstr("switch=true"));
    Preferences other = open();
    EXPECT_EQ(other.boolForKey(kSwitch), true);
    EXPECT_EQ(other.stringForKey(kFolder), "/a b");
}

TEST_F(PreferencesTest, FoldersOnTheWayToTheFileAreMade) {
    file = directory.path("new/folder/app.conf");
    open().setBool(true, kSwitch);
    EXPECT_EQ(open().boolForKey(kSwitch), true);
    EXPECT_THAT(log.take(), ElementsAre());
}

TEST_F(PreferencesTest, DamagedFileIsReadAsFarAsItMakesSenseAndKeptBesideTheNewOne) {
    const std::string damaged = "[General]\nswitch=true\nthis is no line of ours\n";
    directory.write("app.conf", damaged);
    Preferences preferences = open();
    EXPECT_THAT(log.take(), ElementsAre(HasSubstr("is damaged")));
    EXPECT_EQ(preferences.boolForKey(kSwitch), true);
    EXPECT_EQ(contentOf(file), damaged) << "reading must not write";
    preferences.setString("/f", kFolder);
    EXPECT_EQ(contentOf(file + ".damaged"), damaged);
    EXPECT_EQ(open().stringForKey(kFolder), "/f");
}

TEST_F(PreferencesTest, CopiesOfEarlierDamageAreNotOverwritten) {
    directory.write("app.conf.damaged", "earlier");
    directory.write("app.conf", "[General]\nno line\n");
    open().setBool(true, kSwitch);
    EXPECT_EQ(contentOf(file + ".damaged"), "earlier");
    EXPECT_EQ(contentOf(file + ".damaged.1"), "[General]\nno line\n");
}

TEST_F(PreferencesTest, ValueOfAnotherTypeIsReportedAndKeptBeside) {
    directory.write("app.conf", "[General]\nswitch=banana\n");
    Preferences preferences = open();
    EXPECT_EQ(preferences.boolForKey(kSwitch), std::nullopt);
    EXPECT_THAT(log.take(), ElementsAre(testing::AllOf(HasSubstr("switch"), HasSubstr("is not true or false"))));
    preferences.setBool(false, kSwitch);
    EXPECT_THAT(contentOf(file + ".damaged"), HasSubstr("banana"));
}

TEST_F(PreferencesTest, SwitchesAreReadInTheSpellingsThatOccur) {
    directory.write("app.conf", "[General]\na=1\nb=TRUE\nc=0\nd=False\n");
    Preferences preferences = open();
    EXPECT_EQ(preferences.boolForKey("a"), true);
    EXPECT_EQ(preferences.boolForKey("b"), true);
    EXPECT_EQ(preferences.boolForKey("c"), false);
    EXPECT_EQ(preferences.boolForKey("d"), false);
}

TEST_F(PreferencesTest, SomethingElseInPlaceOfTheFileIsLeftAlone) {
    ASSERT_EQ(mkfifo(file.c_str(), 0600), 0); // opening it for reading would wait for ever
    Preferences preferences = open();
    EXPECT_THAT(log.take(), ElementsAre(HasSubstr("not a regular file")));
    preferences.setBool(true, kSwitch);
    struct stat status {};
    ASSERT_EQ(stat(file.c_str(), &status), 0);
    EXPECT_TRUE(S_ISFIFO(status.st_mode));
}

TEST_F(PreferencesTest, FileBeyondTheLimitIsNotReadAndLeftAlone) {
    std::string large = "[General]\nswitch=true\n";
    large.resize(Preferences::kMaximumFileSize, '\n');
    directory.write("app.conf", large);
    EXPECT_EQ(open().boolForKey(kSwitch), true);
    directory.write("app.conf", large + "\n");
    Preferences preferences = open();
    EXPECT_EQ(preferences.boolForKey(kSwitch), std::nullopt);
    preferences.setBool(false, kSwitch);
    EXPECT_EQ(contentOf(file), large + "\n");
    EXPECT_THAT(log.take(), ElementsAre(HasSubstr("larger than 1048576 bytes")));
}

/// Takes from this thread, for a while, what lets root read and write every file.
class AsAnyUser {
  public:
    AsAnyUser() {
        syscall(SYS_capget, &m_header, m_before.data());
        auto without = m_before;
        without[0].effective &= ~(1U << CAP_DAC_OVERRIDE | 1U << CAP_DAC_READ_SEARCH);
        syscall(SYS_capset, &m_header, without.data());
    }
    ~AsAnyUser() { syscall(SYS_capset, &m_header, m_before.data()); }
    AsAnyUser(const AsAnyUser&) = delete;
    AsAnyUser& operator=(const AsAnyUser&) = delete;

  private:
    __user_cap_header_struct m_header{_LINUX_CAPABILITY_VERSION_3, 0};
    std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> m_before{};
};

TEST_F(PreferencesTest, FileThatCannotBeReadIsLeftAlone) {
    directory.write("app.conf", "[General]\nswitch=true\n");
    chmod(file.c_str(), 0200);
    {
        const AsAnyUser user;
        ASSERT_NE(access(file.c_str(), W_OK), -1);
        ASSERT_EQ(contentOf(file), "");
        Preferences preferences = open();
        EXPECT_EQ(preferences.boolForKey(kSwitch), std::nullopt);
        preferences.setBool(false, kSwitch);
    }
    chmod(file.c_str(), 0600);
    EXPECT_THAT(contentOf(file), HasSubstr("switch=true"));
    EXPECT_THAT(log.take(), ElementsAre(HasSubstr("cannot be read")));
}

TEST_F(PreferencesTest, FailureToWriteIsReportedOnce) {
    directory.write("folder", "a file where a folder is needed");
    file = directory.path("folder/app.conf");
    Preferences preferences = open();
    preferences.setBool(true, kSwitch);
    preferences.setBool(true, kSwitch);
    EXPECT_THAT(log.take(), ElementsAre(HasSubstr("could not be saved")));
}

} // namespace
} // namespace qivo

#include "app/AppData.h"

#include "tests/platform/LogCapture.h"
#include "tests/platform/TemporaryDirectory.h"

#include <QDir>
#include <QFile>

#include <array>
#include <atomic>
#include <chrono>
#include <future>
#include <gmock/gmock.h>
#include <limits>
#include <thread>
#include <vector>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

/// A home and a preferences file of the test's own.
class AppDataTest : public testing::Test {
  protected:
    void SetUp() override {
        qputenv("HOME", home.path().c_str());
        ASSERT_EQ(QDir::homePath().toStdString(), home.path());
    }

    std::unique_ptr<AppData> make() const {
        auto model = std::make_unique<AppData>(store());
        model->setRecorderPath(QString()); // not the one that this machine may have
        return model;
    }

    std::unique_ptr<Preferences> store() const {
        return std::make_unique<Preferences>(QString::fromStdString(directory.path("app.conf")));
    }

    void stored(const std::string& lines) const { directory.write("app.conf", "[General]\n" + lines); }

    TemporaryDirectory home;
    TemporaryDirectory directory;
};

/// What the model announced, in order.
class Notices {
  public:
    explicit Notices(AppData& model) : m_model(model) {
        note("isLowBandwidth", &AppData::isLowBandwidthChanged);
        note("mute", &AppData::muteChanged);
        note("deviceWebpageURL", &AppData::deviceWebpageURLChanged);
        note("count", &AppData::selectedQIVOSourceChangedCountChanged);
        note("hasPTZControl", &AppData::hasPTZControlChanged);
        note("recordingFolder", &AppData::recordingFolderChanged);
        note("isRecording", &AppData::isRecordingChanged);
    }

    std::vector<std::string> take() { return std::exchange(m_lines, {}); }

  private:
    void note(const char* name, void (AppData::*signal)()) {
        QObject::connect(&m_model, signal, &m_model, [this, name] { m_lines.emplace_back(name); });
    }

    AppData& m_model;
    std::vector<std::string> m_lines;
};

QIVOlib_recv_instance_t receiver() {
    static int target = 0;
    return reinterpret_cast<QIVOlib_recv_instance_t>(&target);
}

TEST_F(AppDataTest, FirstRunWithoutPreferencesAndMoviesFolderUsesHomeAndSwitchesOff) {
    const auto model = make();
    EXPECT_EQ(model->recordingFolder().toStdString(), home.path());
    EXPECT_FALSE(model->isLowBandwidth());
    EXPECT_FALSE(model->mute());
}

TEST_F(AppDataTest, MoviesFolderIsTheDefaultWhereItExists) {
    QDir(QDir::homePath()).mkdir("Movies");
    EXPECT_EQ(make()->recordingFolder().toStdString(), home.path("Movies"));
}

TEST_F(AppDataTest, MoviesThatIsAPlainFileIsNotUsed) {
    home.write("Movies", "not a folder");
    EXPECT_EQ(make()->recordingFolder().toStdString(), home.path());
}

TEST_F(AppDataTest, StoredEmptyRecordFolderKeepsTheDefault) {
    stored("ORVQIVOViewer_recordFolder=\n");
    EXPECT_EQ(make()->recordingFolder().toStdString(), home.path());
}

TEST_F(AppDataTest, StoredRecordFolderIsUsedAlthoughItDoesNotExist) {
    stored("ORVQIVOViewer_recordFolder=/nowhere/at all\n");
    EXPECT_EQ(make()->recordingFolder(), "/nowhere/at all");
}

TEST_F(AppDataTest, StoredSwitchesAreLoadedUnderTheirFixedSpelling) {
    stored("ORVQIVOViewer_isLowBandwith=true\nORVQIVOViewer_mute=true\n");
    const auto model = make();
    EXPECT_TRUE(model->isLowBandwidth());
    EXPECT_TRUE(model->mute());

    stored("ORVQIVOViewer_isLowBandwidth=true\n");
    EXPECT_FALSE(make()->isLowBandwidth());
}

TEST_F(AppDataTest, StoredValuesOfAnotherTypeGiveDefaultsAndAreReported) {
    stored("ORVQIVOViewer_isLowBandwith=perhaps\nORVQIVOViewer_mute=\nORVQIVOViewer_recordFolder=a, b\n");
    LogCapture log;
    const auto model = make();
    EXPECT_FALSE(model->isLowBandwidth());
    EXPECT_FALSE(model->mute());
    EXPECT_EQ(model->recordingFolder().toStdString(), home.path());
    EXPECT_THAT(log.take(), ElementsAre(HasSubstr("ORVQIVOViewer_isLowBandwith"), HasSubstr("ORVQIVOViewer_mute"),
                                        HasSubstr("ORVQIVOViewer_recordFolder")));
}

TEST_F(AppDataTest, EverythingElseStartsEmpty) {
    const auto model = make();
    QString name = "before";
    QString url = "before";
    model->getQIVOSourceInfoNamed(name, url);
    EXPECT_TRUE(name.isNull());
    EXPECT_TRUE(url.isNull());
    EXPECT_TRUE(model->deviceWebpageURL().isNull());
    EXPECT_FALSE(model->hasDeviceWebpage());
    EXPECT_EQ(model->selectedQIVOSourceChangedCount(), 0);
    EXPECT_EQ(model->ptzSource(), nullptr);
    EXPECT_FALSE(model->hasPTZControl());
    EXPECT_FALSE(model->isRecording());
}

TEST_F(AppDataTest, SerializeSavesTheThreeSettingsForTheNextRun) {
    const auto model = make();
    model->setIsLowBandwidth(true);
    model->setMute(true);
    model->setRecordingFolder("/tmp/Rec & Play, \"take\" 2 \xc3\xbc");
    model->serialize();
    const auto next = make();
    EXPECT_TRUE(next->isLowBandwidth());
    EXPECT_TRUE(next->mute());
    EXPECT_EQ(next->recordingFolder(), model->recordingFolder());
}

TEST_F(AppDataTest, SettingsAreNotSavedWithoutSerialize) {
    make()->setMute(true);
    EXPECT_FALSE(make()->mute());
}

TEST_F(AppDataTest, SelectingAnnouncesInOrderAndStoresThePair) {
    const auto model = make();
    model->setPtzSource(receiver());
    model->setIsRecording(true);
    Notices notices(*model);
    model->setQIVOSourceInfoNamed("STUDIO (Cam 1)", "rtsp://a");
    EXPECT_THAT(notices.take(), ElementsAre("hasPTZControl", "count", "isRecording"));
    EXPECT_EQ(model->ptzSource(), nullptr);
    EXPECT_EQ(model->selectedQIVOSourceName(), "STUDIO (Cam 1)");
    EXPECT_EQ(model->selectedQIVOSourceURL(), "rtsp://a");
    EXPECT_EQ(model->selectedQIVOSourceChangedCount(), 1);
    EXPECT_FALSE(model->isRecording());
}

TEST_F(AppDataTest, SelectingTheSameSourceTwiceRaisesTheCounterByTwoAndEndsEachRecording) {
    const auto model = make();
    for (int count = 1; count <= 2; ++count) {
        model->setIsRecording(true);
        model->setQIVOSourceInfoNamed("A", "u");
        EXPECT_EQ(model->selectedQIVOSourceChangedCount(), count);
        EXPECT_FALSE(model->isRecording());
    }
}

TEST_F(AppDataTest, SelectingWithAnEmptyOrMissingPartKeepsTheDifference) {
    const auto model = make();
    model->setQIVOSourceInfoNamed(QString(), QStringLiteral(""));
    QString name = "before";
    QString url;
    model->getQIVOSourceInfoNamed(name, url);
    EXPECT_TRUE(name.isNull());
    EXPECT_FALSE(url.isNull());
    EXPECT_TRUE(url.isEmpty());
}

TEST_F(AppDataTest, ObserversOfTheCounterAreToldWhileTheLockIsHeldAndMayReadThePair) {
    const auto model = make();
    QString seen;
    std::atomic<bool> otherAsks = false;
    std::atomic<bool> otherRead = false;
    bool otherReadTooEarly = false;
    std::thread other;
    QObject::connect(model.get(), &AppData::selectedQIVOSourceChangedCountChanged, model.get(), [&] {
        QString url;
        model->getQIVOSourceInfoNamed(seen, url);
        other = std::thread([&] {
            QString name;
            QString address;
            otherAsks = true;
            model->getQIVOSourceInfoNamed(name, address);
            otherRead = true;
        });
        while (!otherAsks) {
            std::this_thread::yield();
        }
        // The lock keeps the other thread out for as long as this observer likes.
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        otherReadTooEarly = otherRead;
    });
    model->setQIVOSourceInfoNamed("A", "u");
    other.join();
    EXPECT_EQ(seen, "A");
    EXPECT_FALSE(otherReadTooEarly);
    EXPECT_TRUE(otherRead);
}

TEST_F(AppDataTest, ClearingThePTZSourceWithoutOneSendsNoNotice) {
    const auto model = make();
    Notices notices(*model);
    model->clearPTZSource();
    EXPECT_THAT(notices.take(), ElementsAre());
    model->setPtzSource(receiver());
    model->clearPTZSource();
    model->clearPTZSource();
    EXPECT_THAT(notices.take(), ElementsAre("hasPTZControl"));
}

TEST_F(AppDataTest, SelectingForgetsThePTZSourceBeforeItTakesTheLock) {
    const auto model = make();
    model->setQIVOSourceInfoNamed("before", "u");
    model->setPtzSource(receiver());
    std::future<QString> other;
    QObject::connect(model.get(), &AppData::hasPTZControlChanged, model.get(), [&] {
        other = std::async(std::launch::async, [&] {
            QString name;
            QString url;
            model->getQIVOSourceInfoNamed(name, url);
            return name;
        });
        EXPECT_EQ(other.wait_for(std::chrono::seconds(5)), std::future_status::ready) << "the lock is held";
    });
    model->setQIVOSourceInfoNamed("after", "u");
    ASSERT_TRUE(other.valid());
    EXPECT_EQ(other.get(), "before");
}

TEST_F(AppDataTest, SettingThePTZSourceSendsNoNotice) {
    const auto model = make();
    Notices notices(*model);
    model->setPtzSource(receiver());
    EXPECT_TRUE(model->hasPTZControl());
    EXPECT_THAT(notices.take(), ElementsAre());
}

TEST_F(AppDataTest, PTZControlIsGoneWhenItsEndIsAnnounced) {
    const auto model = make();
    model->setPtzSource(receiver());
    bool had = true;
    QObject::connect(model.get(), &AppData::hasPTZControlChanged, model.get(), [&] { had = model->hasPTZControl(); });
    model->clearPTZSource();
    EXPECT_FALSE(had);
}

TEST_F(AppDataTest, HasDeviceWebpageFollowsTheLengthOfTheAddress) {
    const auto model = make();
    EXPECT_FALSE(model->hasDeviceWebpage());
    model->setDeviceWebpageURL("http://camera/");
    EXPECT_TRUE(model->hasDeviceWebpage());
    model->setDeviceWebpageURL("");
    EXPECT_FALSE(model->hasDeviceWebpage());
    EXPECT_FALSE(model->deviceWebpageURL().isNull());
}

TEST_F(AppDataTest, SettersAnnounceEveryCallAlsoWhenNothingChanges) {
    const auto model = make();
    Notices notices(*model);
    for (int i = 0; i < 2; ++i) {
        model->setIsLowBandwidth(true);
        model->setMute(true);
        model->setIsRecording(true);
        model->setSelectedQIVOSourceChangedCount(7);
        model->setRecordingFolder("/r");
        EXPECT_THAT(notices.take(), ElementsAre("isLowBandwidth", "mute", "isRecording", "count", "recordingFolder"));
    }
}

TEST_F(AppDataTest, PropertiesAreReadableByName) {
    const auto model = make();
    model->setPtzSource(receiver());
    model->setQIVOSourceInfoNamed("A", "u");
    EXPECT_EQ(model->property("selectedQIVOSourceName").toString(), "A");
    EXPECT_EQ(model->property("selectedQIVOSourceURL").toString(), "u");
    EXPECT_EQ(model->property("selectedQIVOSourceChangedCount").toInt(), 1);
    EXPECT_FALSE(model->property("hasPTZControl").toBool());
    for (const char* name : {"isLowBandwidth", "mute", "isRecording"}) {
        EXPECT_TRUE(model->setProperty(name, true)) << name;
        EXPECT_TRUE(model->property(name).toBool()) << name;
    }
}

TEST_F(AppDataTest, CounterPastItsLargestValueIsDefined) {
    const auto model = make();
    model->setSelectedQIVOSourceChangedCount(std::numeric_limits<std::int32_t>::max());
    model->setQIVOSourceInfoNamed("A", "u");
    EXPECT_EQ(model->selectedQIVOSourceChangedCount(), std::numeric_limits<std::int32_t>::min());
}

TEST_F(AppDataTest, SharedModelIsMadeOnceThoughManyThreadsAskAtOnce) {
    qputenv("XDG_CONFIG_HOME", directory.path().c_str());
    std::array<AppData*, 8> found{};
    std::atomic<int> ready = 0;
    std::vector<std::thread> threads;
    threads.reserve(found.size());
    for (AppData*& mine : found) {
        threads.emplace_back([&] {
            ++ready;
            while (ready < static_cast<int>(found.size())) {
            }
            mine = AppData::inst();
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_NE(found[0], nullptr);
    EXPECT_THAT(found, testing::Each(found[0]));
}

TEST_F(AppDataTest, ReadersOfThePairNeverSeeHalvesOfTwoSelections) {
    const auto model = make();
    std::atomic<bool> done = false;
    std::atomic<int> mixed = 0;
    std::atomic<int> reads = 0;
    std::vector<std::thread> readers;
    readers.reserve(3);
    for (int i = 0; i < 3; ++i) {
        readers.emplace_back([&] {
            while (!done) {
                QString name;
                QString url;
                model->getQIVOSourceInfoNamed(name, url);
                mixed += static_cast<int>(name != url);
                static_cast<void>(model->deviceWebpageURL().size());
                static_cast<void>(model->selectedQIVOSourceChangedCount() + static_cast<int>(model->mute()));
                ++reads;
            }
        });
    }
    for (int i = 0; i < 2000 || reads < 2000; ++i) {
        const QString both = QString::number(i);
        model->setQIVOSourceInfoNamed(both, both);
        model->setDeviceWebpageURL(both);
        model->setMute(i % 2 == 0);
    }
    done = true;
    for (std::thread& reader : readers) {
        reader.join();
    }
    EXPECT_EQ(mixed, 0);
}

} // namespace
} // namespace qivo

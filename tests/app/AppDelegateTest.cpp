#include "app/AppDelegate.h"

#include "app/MainWindow.h"
#include "app/ViewController.h"
#include "platform/Application.h"
#include "platform/Preferences.h"
#include "platform/Resources.h"
#include "platform/UrlOpener.h"
#include "tests/app/RecorderScript.h"
#include "tests/app/ShellFixture.h"
#include "tests/audio/FakeAudioQueue.h"
#include "tests/platform/LogCapture.h"

#include <QDialogButtonBox>
#include <QFile>
#include <QFileDialog>
#include <QFileInfo>
#include <QLineEdit>
#include <QPushButton>
#include <QSignalSpy>

#include <vector>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class AppDelegateTest : public test::ShellFixture {
  protected:
    void SetUp() override {
        ShellFixture::SetUp();
        model.setQIVOSourceInfoNamed("", ""); // another case may have chosen one
        queue.reset();
        setUrlOpener([this](const QUrl& url) {
            opened.push_back(url.toString().toStdString());
            return true;
        });
    }

    void TearDown() override {
        setUrlOpener({});
        ShellFixture::TearDown();
    }

    /// What goes to standard output meanwhile.
    static std::string printed(const std::function<void()>& action) {
        testing::internal::CaptureStdout();
        action();
        return testing::internal::GetCapturedStdout();
    }

    std::vector<std::string> opened;
    test::FakeAudioQueue& queue = test::FakeAudioQueue::instance();
};

TEST_F(AppDelegateTest, LibraryIsInitialisedWithTheControllerAndDestroyedWithIt) {
    EXPECT_EQ(printed([] { const AppDelegate delegate; }), "");
    EXPECT_THAT(fake.calls(), ElementsAre("initialize()", "destroy()"));
}

TEST_F(AppDelegateTest, LibraryThatCannotRunIsReportedWithoutLineEndAndStartUpGoesOn) {
    fake.setInitializes(false);
    EXPECT_EQ(printed([] { const AppDelegate delegate; }), "Cannot run QIVO.");
    AppDelegate delegate;
    EXPECT_FALSE(delegate.startQIVO());
    fake.setInitializes(true);
    EXPECT_TRUE(delegate.startQIVO());
    delegate.applicationDidFinishLaunching();
    delegate.applicationWillTerminate();
}

TEST_F(AppDelegateTest, UsesTheSharedModel) {
    const AppDelegate delegate;
    EXPECT_EQ(delegate.theModel(), AppData::inst());
    EXPECT_TRUE(delegate.applicationShouldTerminateAfterLastWindowClosed());
}

TEST_F(AppDelegateTest, LaunchNoticeMakesTheFinderThatTheMenuHasNotYet) {
    AppDelegate delegate;
    fake.setFinderCreates(false);
    QIVOFileMenu menu;
    delegate.setQivoSourcesMenu(&menu);
    fake.setFinderCreates(true);
    delegate.applicationDidFinishLaunching();
    EXPECT_EQ(fake.openFinders(), 1);
    delegate.applicationWillTerminate();
}

TEST_F(AppDelegateTest, TerminationEndsTheFinderThenTheRecordingAndSavesTheSettingsLast) {
    const QString file = Preferences::userFile();
    QFile::remove(file);
    AppDelegate delegate;
    QIVOFileMenu menu;
    delegate.setQivoSourcesMenu(&menu);
    delegate.applicationDidFinishLaunching();
    model.setIsRecording(true);
    model.setMute(true);
    std::vector<std::string> order;
    fake.setHook([&](const std::string& call) { order.push_back(call); });
    QObject context;
    QObject::connect(&model, &AppData::isRecordingChanged, &context, [&] {
        order.emplace_back(model.isRecording() ? "recording" : "recording ended");
        EXPECT_FALSE(QFileInfo::exists(file)) << "settings are saved after the recorder has stopped";
    });
    delegate.applicationWillTerminate();
    EXPECT_THAT(order, ElementsAre("find_destroy(f1)", "recording ended"));
    EXPECT_EQ(Preferences(file).boolForKey(AppData::kMuteKey), true);
    fake.setHook({});
}

TEST_F(AppDelegateTest, TerminationWaitsForTheRecorderAfterTheFinderAndBeforeTheSettingsAreSaved) {
    const QString file = Preferences::userFile();
    QFile::remove(file);
    const test::RecorderScript script;
    model.setRecorderPath(QString::fromStdString(script.program("chatty")));
    AppDelegate delegate;
    QIVOFileMenu menu;
    delegate.setQivoSourcesMenu(&menu);
    delegate.applicationDidFinishLaunching();
    model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
    model.setIsRecording(true);
    ASSERT_TRUE(script.waitForStarts(1));
    std::vector<int> ends;
    fake.setHook([&](const std::string& call) {
        if (call == "find_destroy(f1)") {
            ends.push_back(script.ends());
        }
    });
    QObject context;
    QObject::connect(&model, &AppData::isRecordingChanged, &context, [&] {
        ends.push_back(script.ends());
        EXPECT_FALSE(QFileInfo::exists(file)) << "settings are saved after the recorder has stopped";
    });
    delegate.applicationWillTerminate();
    fake.setHook({});
    EXPECT_THAT(ends, ElementsAre(0, 1));
    EXPECT_TRUE(QFileInfo::exists(file));
}

TEST_F(AppDelegateTest, TerminationWithoutLaunchAndWithoutMenuIsHarmless) {
    AppDelegate delegate;
    delegate.applicationWillTerminate();
    delegate.applicationWillTerminate();
    EXPECT_TRUE(QFileInfo::exists(Preferences::userFile()));
}

TEST_F(AppDelegateTest, PlayerExistsFromLaunchCompletionToTermination) {
    AppDelegate delegate;
    EXPECT_EQ(delegate.audioPlayer(), nullptr);
    model.setMute(true);
    delegate.applicationDidFinishLaunching();
    ASSERT_NE(delegate.audioPlayer(), nullptr);
    EXPECT_TRUE(delegate.audioPlayer()->mute()) << "a binding hands over the value that it finds";
    EXPECT_EQ(delegate.audioPlayer()->sourceChangedCounter(), model.selectedQIVOSourceChangedCount());
    delegate.applicationWillTerminate();
    EXPECT_EQ(delegate.audioPlayer(), nullptr);
    model.setMute(false); // reaches nobody any more
}

TEST_F(AppDelegateTest, PlayerFollowsTheModelsMuteAndSelectionCounter) {
    AppDelegate delegate;
    delegate.applicationDidFinishLaunching();
    AudioPlayback& player = *delegate.audioPlayer();
    model.setMute(true);
    EXPECT_TRUE(player.mute());
    model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
    EXPECT_EQ(player.sourceChangedCounter(), model.selectedQIVOSourceChangedCount());
    EXPECT_THAT(queue.calls, IsEmpty()) << "choosing a source while muted starts nothing";
    EXPECT_EQ(printed([&] { model.setMute(false); }), "Playing \n");
    EXPECT_FALSE(player.mute());
    delegate.applicationWillTerminate();
}

TEST_F(AppDelegateTest, MuteThatWasRestoredIsSilenceUntilItIsTurnedOff) {
    model.setMute(true); // as the settings did
    AppDelegate delegate;
    delegate.applicationDidFinishLaunching();
    EXPECT_EQ(printed([&] { model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1"); }), "");
    EXPECT_THAT(queue.calls, IsEmpty());
    EXPECT_EQ(printed([&] { model.setMute(false); }), "Playing \n");
    EXPECT_NE(queue.queue, nullptr);
    delegate.applicationWillTerminate();
}

TEST_F(AppDelegateTest, SourceThatIsChosenBeforeLaunchCompletionIsPlayedFromThenOn) {
    AppDelegate delegate;
    model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1");
    EXPECT_THAT(queue.calls, IsEmpty());
    EXPECT_EQ(printed([&] { delegate.applicationDidFinishLaunching(); }), "Playing \n");
    delegate.applicationWillTerminate();
}

TEST_F(AppDelegateTest, TerminationShutsThePlayerDownBeforeTheFinderEnds) {
    AppDelegate delegate;
    QIVOFileMenu menu;
    delegate.setQivoSourcesMenu(&menu);
    delegate.applicationDidFinishLaunching();
    printed([&] { model.setQIVOSourceInfoNamed("STUDIO (Cam 1)", "fake://1"); });
    ASSERT_FALSE(queue.buffers().empty());
    queue.playOut(queue.buffers().front()); // the player's own receiver is made by its first callback
    ASSERT_EQ(fake.openReceivers(), 1);
    fake.takeCalls();
    delegate.applicationWillTerminate();
    EXPECT_THAT(fake.calls(), ElementsAre("recv_destroy(r1)", "find_destroy(f1)"));
    EXPECT_EQ(queue.queue, nullptr) << "the queue is disposed of";
}

TEST_F(AppDelegateTest, SourcesMenuIsHeldWeakly) {
    AppDelegate delegate;
    auto menu = std::make_unique<QIVOFileMenu>();
    delegate.setQivoSourcesMenu(menu.get());
    EXPECT_EQ(delegate.qivoSourcesMenu(), menu.get());
    menu.reset();
    EXPECT_EQ(delegate.qivoSourcesMenu(), nullptr);
}

class SelectionTest : public AppDelegateTest {
  protected:
    void SetUp() override {
        AppDelegateTest::SetUp();
        delegate = std::make_unique<AppDelegate>();
        menu = std::make_unique<QIVOFileMenu>();
        delegate->setQivoSourcesMenu(menu.get());
        fake.setSources({{"STUDIO (Cam 1)", "fake://1"}, {"STUDIO (Cam 2)", "fake://2"}});
        menu->updateMenu();
        count = model.selectedQIVOSourceChangedCount();
    }

    std::string select(qint64 tag) const {
        QAction item;
        item.setData(tag);
        return printed([&] { delegate->handleSelQIVOSource(&item); });
    }

    std::unique_ptr<AppDelegate> delegate;
    std::unique_ptr<QIVOFileMenu> menu;
    int count = 0;
};

TEST_F(SelectionTest, ChosenItemSelectsTheSourceAtItsTag) {
    EXPECT_EQ(select(1), "selected a QIVO source \n");
    EXPECT_EQ(model.selectedQIVOSourceName(), "STUDIO (Cam 2)");
    EXPECT_EQ(model.selectedQIVOSourceURL(), "fake://2");
    EXPECT_EQ(model.selectedQIVOSourceChangedCount(), count + 1);
}

TEST_F(SelectionTest, IndexNoLongerInRangeChangesNothing) {
    model.setIsRecording(true);
    for (const qint64 tag : {2, -1, 1000}) {
        EXPECT_EQ(select(tag), "selected a QIVO source \n");
    }
    EXPECT_EQ(model.selectedQIVOSourceChangedCount(), count);
    EXPECT_TRUE(model.isRecording());
}

TEST_F(SelectionTest, TagIsCutToThirtyTwoBits) {
    select((qint64{1} << 32) + 1);
    EXPECT_EQ(model.selectedQIVOSourceName(), "STUDIO (Cam 2)");
}

TEST_F(SelectionTest, WithoutSenderOrMenuOnlyTheLineIsWritten) {
    EXPECT_EQ(printed([&] { delegate->handleSelQIVOSource(nullptr); }), "selected a QIVO source \n");
    menu.reset();
    EXPECT_EQ(select(0), "selected a QIVO source \n");
    EXPECT_EQ(model.selectedQIVOSourceChangedCount(), count);
}

TEST_F(SelectionTest, SelectionTitlesTheMainWindowLiterallyAndEndsARecording) {
    MainWindow window;
    setMainWindow(&window);
    model.setIsRecording(true);
    select(0);
    EXPECT_EQ(window.windowTitle(), "STUDIO (Cam 1)");
    EXPECT_FALSE(model.isRecording());
    model.setQIVOSourceInfoNamed("A [*] & B", "u");
    EXPECT_EQ(window.windowTitle(), "A [*][*] & B"); // the toolkit shows a doubled mark as the mark itself
    setMainWindow(nullptr);
    select(1);
    EXPECT_EQ(window.windowTitle(), "A [*][*] & B");
}

TEST_F(SelectionTest, WindowHasItsNewTitleBeforeTheRecordingEnds) {
    MainWindow window;
    setMainWindow(&window);
    model.setIsRecording(true);
    std::vector<QString> titles;
    QObject context;
    QObject::connect(&model, &AppData::isRecordingChanged, &context, [&] { titles.push_back(window.windowTitle()); });
    select(0);
    EXPECT_THAT(titles, ElementsAre("STUDIO (Cam 1)"));
    setMainWindow(nullptr);
}

TEST_F(AppDelegateTest, PagesThatShipWithTheApplicationAreOpened) {
    AppDelegate delegate;
    delegate.gotoOrvaneHomePage();
    delegate.gotoQIVOWebpage();
    const std::string pages = "file://" + resourcePath() + "/pages/";
    EXPECT_THAT(opened, ElementsAre(pages + "home.html", pages + "qivo.html"));
}

TEST_F(AppDelegateTest, DeviceWebpageIsOpenedWhereThereIsOne) {
    AppDelegate delegate;
    delegate.gotoDeviceWebpage();
    model.setDeviceWebpageURL("");
    delegate.gotoDeviceWebpage();
    EXPECT_THAT(opened, IsEmpty());
    model.setDeviceWebpageURL("http://camera.local:8080/?a=b#c");
    delegate.gotoDeviceWebpage();
    EXPECT_THAT(opened, ElementsAre("http://camera.local:8080/?a=b#c"));
}

TEST_F(AppDelegateTest, DeviceWebpageThatIsNoWebAddressIsNotOpened) {
    AppDelegate delegate;
    LogCapture log;
    for (const char* address : {"file:///bin/sh", "javascript:alert(1)", "camera", "http://[", "smb://camera/share"}) {
        model.setDeviceWebpageURL(address);
        delegate.gotoDeviceWebpage();
        EXPECT_THAT(log.take(), ElementsAre(HasSubstr(address)));
    }
    EXPECT_THAT(opened, IsEmpty());
}

TEST_F(AppDelegateTest, ItemWithTagMinusOneIsEnabledExactlyWhileAPageIsKnown) {
    const AppDelegate delegate;
    QAction item;
    item.setData(-1);
    EXPECT_FALSE(delegate.validateMenuItem(&item));
    model.setDeviceWebpageURL("");
    EXPECT_FALSE(delegate.validateMenuItem(&item));
    model.setDeviceWebpageURL("http://camera/");
    EXPECT_TRUE(delegate.validateMenuItem(&item));
    model.setDeviceWebpageURL("");
    EXPECT_FALSE(delegate.validateMenuItem(&item));
}

TEST_F(AppDelegateTest, ItemWithAnotherTagIsAlwaysEnabled) {
    const AppDelegate delegate;
    QAction item;
    EXPECT_TRUE(delegate.validateMenuItem(&item)) << "no tag";
    for (const int tag : {0, 1, 7, -2}) {
        item.setData(tag);
        EXPECT_TRUE(delegate.validateMenuItem(&item)) << tag;
    }
}

TEST_F(AppDelegateTest, ShowPTZControlWithoutMainWindowOpensAndPrintsNothing) {
    AppDelegate delegate;
    setMainWindow(nullptr);
    const auto windows = QApplication::topLevelWidgets().size();
    LogCapture log;
    EXPECT_EQ(printed([&] { delegate.showPTZControl(); }), "");
    EXPECT_EQ(QApplication::topLevelWidgets().size(), windows);
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(AppDelegateTest, ShowPTZControlPerformsTheSegueOnTheContentViewController) {
    AppDelegate delegate;
    MainWindow window;
    setMainWindow(&window);
    delegate.showPTZControl(); // no content view controller yet
    ViewController controller;
    window.setContentViewController(&controller);
    QSignalSpy performed(&controller, &ViewController::seguePerformed);
    delegate.showPTZControl();
    ASSERT_EQ(performed.count(), 1);
    EXPECT_EQ(performed.at(0).at(0).toString(), "PTZSegue");
    EXPECT_EQ(performed.at(0).at(1).value<QObject*>(), &controller);
}

TEST_F(AppDelegateTest, SettingsCommandDoesNothing) {
    AppDelegate delegate;
    const auto windows = QApplication::topLevelWidgets().size();
    EXPECT_EQ(printed([&] { delegate.handleSettingsMenuClick(); }), "");
    EXPECT_EQ(QApplication::topLevelWidgets().size(), windows);
}

/// The panel in which the user chooses the folder for recordings.
class RecordPathTest : public AppDelegateTest {
  protected:
    void SetUp() override {
        AppDelegateTest::SetUp();
        model.setRecordingFolder(QString::fromStdString(folder.path()));
        std::filesystem::create_directory(folder.path("takes"));
        folder.write("plain", "no folder");
    }

    void TearDown() override {
        delete panel();
        AppDelegateTest::TearDown();
    }

    QFileDialog* open() {
        delegate.setRecordPath();
        return panel();
    }

    static QFileDialog* panel() {
        for (QWidget* widget : QApplication::topLevelWidgets()) {
            if (auto* found = qobject_cast<QFileDialog*>(widget)) {
                return found;
            }
        }
        return nullptr;
    }

    /// Goes to a directory and presses the button that accepts it.
    static void answer(QFileDialog* panel, const std::string& path) {
        panel->setDirectory(QString::fromStdString(path));
        panel->findChild<QLineEdit*>()->clear();
        for (QAbstractButton* button : panel->findChild<QDialogButtonBox*>()->buttons()) {
            if (panel->findChild<QDialogButtonBox*>()->buttonRole(button) == QDialogButtonBox::AcceptRole) {
                button->click();
            }
        }
    }

    static bool isClosed() {
        return test::runUntil([] { return panel() == nullptr; });
    }

    TemporaryDirectory folder;
    AppDelegate delegate;
};

TEST_F(RecordPathTest, PanelIsASheetOfTheMainWindowForDirectoriesOnly) {
    MainWindow window;
    setMainWindow(&window);
    window.show();
    const QFileDialog* sheet = open();
    ASSERT_NE(sheet, nullptr);
    EXPECT_TRUE(sheet->isVisible()) << "the command does not wait for the answer";
    EXPECT_EQ(sheet->parentWidget(), &window);
    EXPECT_EQ(sheet->windowModality(), Qt::WindowModal);
    EXPECT_EQ(sheet->windowTitle(), "Choose the directory for recordings.");
    EXPECT_EQ(sheet->fileMode(), QFileDialog::Directory);
    EXPECT_TRUE(sheet->testOption(QFileDialog::ShowDirsOnly));
    EXPECT_EQ(sheet->acceptMode(), QFileDialog::AcceptOpen);
    EXPECT_EQ(sheet->directory().path().toStdString(), folder.path());
    delete panel();
}

TEST_F(RecordPathTest, ChosenDirectoryBecomesTheFolderForRecordings) {
    QSignalSpy changes(&model, &AppData::recordingFolderChanged);
    answer(open(), folder.path("takes"));
    EXPECT_TRUE(isClosed());
    EXPECT_EQ(model.recordingFolder().toStdString(), folder.path("takes"));
    EXPECT_EQ(changes.count(), 1);
}

TEST_F(RecordPathTest, DirectoryOfAnyNameIsTakenAsItIs) {
    for (const std::string name : {"two  blanks", "100 % \"quoted\" (it's)", "\xf0\x9f\x8e\xa5 ä"}) {
        std::filesystem::create_directory(folder.path(name));
        answer(open(), folder.path(name));
        EXPECT_TRUE(isClosed());
        EXPECT_EQ(model.recordingFolder().toStdString(), folder.path(name));
    }
}

TEST_F(RecordPathTest, CancellingThePanelLeavesTheFolder) {
    QSignalSpy changes(&model, &AppData::recordingFolderChanged);
    open()->reject();
    EXPECT_TRUE(isClosed());
    open()->close();
    EXPECT_TRUE(isClosed());
    EXPECT_EQ(model.recordingFolder().toStdString(), folder.path());
    EXPECT_EQ(changes.count(), 0);
}

TEST_F(RecordPathTest, FolderThatHasGoneDoesNotKeepThePanelFromOpening) {
    model.setRecordingFolder(QString::fromStdString(folder.path("gone")));
    answer(open(), folder.path("takes"));
    EXPECT_TRUE(isClosed());
    EXPECT_EQ(model.recordingFolder().toStdString(), folder.path("takes"));
}

TEST_F(RecordPathTest, WithoutMainWindowThePanelStandsAlone) {
    setMainWindow(nullptr);
    const QFileDialog* alone = open();
    ASSERT_NE(alone, nullptr);
    EXPECT_TRUE(alone->isVisible());
    EXPECT_EQ(alone->parentWidget(), nullptr);
    answer(panel(), folder.path("takes"));
    EXPECT_TRUE(isClosed());
    EXPECT_EQ(model.recordingFolder().toStdString(), folder.path("takes"));
}

TEST_F(RecordPathTest, OpenPanelIsNotOpenedTwice) {
    const QFileDialog* first = open();
    const auto windows = QApplication::topLevelWidgets().size();
    EXPECT_EQ(open(), first);
    EXPECT_EQ(QApplication::topLevelWidgets().size(), windows);
}

TEST_F(RecordPathTest, WindowThatGoesTakesItsPanelAlong) {
    auto window = std::make_unique<MainWindow>();
    setMainWindow(window.get());
    window->show();
    open();
    window.reset();
    EXPECT_EQ(panel(), nullptr);
    EXPECT_NE(open(), nullptr) << "a new one";
}

} // namespace
} // namespace qivo

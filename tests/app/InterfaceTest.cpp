#include "app/Interface.h"

#include "app/MainWindow.h"
#include "app/ViewController.h"
#include "app/WindowController.h"
#include "platform/Application.h"
#include "platform/UrlOpener.h"
#include "ptz/PTZPanel.h"
#include "tests/app/ShellFixture.h"
#include "tests/support/Screen.h"
#include "video/VideoView.h"

#include <QAccessible>
#include <QFileDialog>
#include <QKeyEvent>
#include <QMenuBar>
#include <QProcess>
#include <QScreen>
#include <QSignalSpy>
#include <QToolButton>

#include <dlfcn.h>
#include <link.h>
#include <set>

namespace qivo {
namespace {

using test::runUntil;
using testing::Contains;
using testing::ElementsAre;

/// The interface as it comes out of its files, not shown.
class InterfaceTest : public test::ShellFixture {
  protected:
    void SetUp() override {
        ShellFixture::SetUp();
        interface = std::make_unique<Interface>();
    }

    void TearDown() override {
        interface.reset();
        ShellFixture::TearDown();
    }

    MainWindow& window() { return interface->window(); }
    QAction* action(const char* name) { return window().findChild<QAction*>(name); }
    QToolButton* button(const char* name) { return window().findChild<QToolButton*>(name); }

    std::vector<QToolButton*> switches() {
        return {button("recordSwitch"), button("muteSwitch"), button("lowBandwidthSwitch")};
    }

    std::unique_ptr<Interface> interface;
};

TEST_F(InterfaceTest, LibraryIsInitialisedBeforeTheMenuLooksForSourcesAndDestroyedAfterAllElse) {
    EXPECT_THAT(fake.calls(), ElementsAre("initialize()", "find_create_v2(local=1, groups=null, ips=null)"));
    fake.takeCalls();
    interface.reset();
    EXPECT_THAT(fake.calls(), ElementsAre("find_destroy(f1)", "destroy()"));
    EXPECT_EQ(mainWindow(), nullptr);
}

TEST_F(InterfaceTest, WindowBeginsWithItsTitleAndASensibleSize) {
    EXPECT_EQ(window().windowTitle(), "QIVO Viewer");
    EXPECT_EQ(window().size(), QSize(960, 540));
    EXPECT_EQ(window().minimumSize(), QSize(480, 270));
    EXPECT_NE(qobject_cast<VideoView*>(window().centralWidget()), nullptr);
    EXPECT_EQ(mainWindow(), &window());
    EXPECT_EQ(window().contentViewController(), &interface->viewController());
}

std::vector<std::string> entriesOf(const QMenu& menu) {
    std::vector<std::string> entries;
    for (const QAction* item : menu.actions()) {
        entries.push_back(item->isSeparator() ? "-" : QString(item->text()).remove('&').toStdString());
    }
    return entries;
}

TEST_F(InterfaceTest, MenusAndTheirCommandsComeFromTheInterfaceFile) {
    std::vector<std::string> titles;
    std::vector<std::vector<std::string>> entries;
    for (const QAction* menu : window().menuBar()->actions()) {
        titles.push_back(QString(menu->text()).remove('&').toStdString());
        entries.push_back(entriesOf(*menu->menu()));
    }
    EXPECT_THAT(titles, ElementsAre("QIVO Viewer", "Sources", "Camera", "Recording", "View"));
    EXPECT_THAT(entries,
                ElementsAre(ElementsAre("QIVO Viewer Home Page", "QIVO Web Site", "-", "Settings…", "-", "Quit"),
                            ElementsAre("No Sources Found Yet"), ElementsAre("Web Control Page", "Camera Control"),
                            ElementsAre("Choose the Folder…"), ElementsAre("Full Screen", "Leave Full Screen")));
    EXPECT_TRUE(window().menuBar()->actions().at(1)->text().contains("&S"));
}

TEST_F(InterfaceTest, OnlyTheWebControlPageHasTheTagOfThePage) {
    for (const QAction* item : window().findChildren<QAction*>()) {
        const bool isPage = item->objectName() == "actionWebControlPage";
        EXPECT_EQ(item->data().toInt() == AppDelegate::kDeviceWebpageTag, isPage) << item->text().toStdString();
    }
}

TEST_F(InterfaceTest, RecordingFolderCanAlwaysBeChosen) {
    EXPECT_TRUE(action("actionRecordingFolder")->isEnabled());
    model.setDeviceWebpageURL("");
    EXPECT_TRUE(action("actionRecordingFolder")->isEnabled());
    action("actionRecordingFolder")->trigger();
    const auto* panel = window().findChild<QFileDialog*>();
    ASSERT_NE(panel, nullptr);
    EXPECT_EQ(panel->windowTitle(), AppDelegate::kRecordPathMessage);
}

TEST_F(InterfaceTest, ShortcutsAndMenuKeysDoNotClash) {
    std::vector<std::string> keys;
    for (const QAction* item : window().findChildren<QAction*>()) {
        if (!item->shortcut().isEmpty()) {
            keys.push_back(item->shortcut().toString().toStdString());
        }
    }
    for (const QToolButton* control : switches()) {
        keys.push_back(control->shortcut().toString().toStdString());
    }
    for (const QAction* menu : window().menuBar()->actions()) {
        keys.push_back(QKeySequence::mnemonic(menu->text()).toString().toStdString());
    }
    EXPECT_EQ(keys.size(), std::set<std::string>(keys.begin(), keys.end()).size()) << testing::PrintToString(keys);
    for (const char* key : {"Ctrl+Q", "F11", "Esc", "Alt+S", "Ctrl+R", "Ctrl+M", "Ctrl+L"}) {
        EXPECT_THAT(keys, Contains(key));
    }
}

TEST_F(InterfaceTest, SwitchesTellTheirNamePurposeAndKey) {
    for (QToolButton* control : switches()) {
        ASSERT_NE(control, nullptr);
        EXPECT_FALSE(control->accessibleName().isEmpty());
        EXPECT_TRUE(control->toolTip().contains(control->shortcut().toString())) << control->toolTip().toStdString();
        EXPECT_FALSE(control->icon().isNull());
        QAccessibleInterface* accessible = QAccessible::queryAccessibleInterface(control);
        ASSERT_NE(accessible, nullptr);
        EXPECT_EQ(accessible->text(QAccessible::Name), control->accessibleName());
        EXPECT_TRUE(accessible->state().checkable);
        EXPECT_NE(control->focusPolicy() & Qt::TabFocus, 0);
    }
}

TEST_F(InterfaceTest, SwitchesLookDifferentWhenOn) {
    for (const QToolButton* control : switches()) {
        const QImage off = control->icon().pixmap(32, QIcon::Normal, QIcon::Off).toImage();
        const QImage on = control->icon().pixmap(32, QIcon::Normal, QIcon::On).toImage();
        EXPECT_NE(off, on) << control->objectName().toStdString();
    }
}

TEST_F(InterfaceTest, SwitchesAndModelFollowEachOther) {
    button("muteSwitch")->click();
    button("lowBandwidthSwitch")->click();
    button("recordSwitch")->click();
    EXPECT_TRUE(model.mute());
    EXPECT_TRUE(model.isLowBandwidth());
    EXPECT_TRUE(model.isRecording());
    model.setMute(false);
    model.setIsLowBandwidth(false);
    model.setQIVOSourceInfoNamed("A", "u"); // ends the recording
    for (const QToolButton* control : switches()) {
        EXPECT_FALSE(control->isChecked()) << control->objectName().toStdString();
    }
}

TEST_F(InterfaceTest, WebControlPageIsEnabledByWhatTheReceiverReportsOnItsThread) {
    QAction* page = action("actionWebControlPage");
    EXPECT_FALSE(page->isEnabled());
    std::thread([&] { model.setDeviceWebpageURL("http://camera/"); }).join();
    EXPECT_TRUE(runUntil([&] { return page->isEnabled(); }));
    std::thread([&] { model.setDeviceWebpageURL(""); }).join();
    EXPECT_TRUE(runUntil([&] { return !page->isEnabled(); }));
}

TEST_F(InterfaceTest, CommandsAreValidatedWhenTheirMenuIsAboutToShow) {
    QAction* page = action("actionWebControlPage");
    page->setEnabled(true);
    emit window().findChild<QMenu*>("menuCamera")->aboutToShow();
    EXPECT_FALSE(page->isEnabled());
}

TEST_F(InterfaceTest, CommandsReachTheController) {
    std::vector<std::string> opened;
    setUrlOpener([&](const QUrl& url) {
        opened.push_back(url.fileName().toStdString());
        return true;
    });
    QSignalSpy segues(&interface->viewController(), &ViewController::seguePerformed);
    action("actionHomePage")->trigger();
    action("actionQIVOWebSite")->trigger();
    model.setDeviceWebpageURL("http://camera/page");
    action("actionWebControlPage")->trigger();
    action("actionCameraControl")->trigger();
    action("actionSettings")->trigger();
    setUrlOpener({});
    EXPECT_THAT(opened, ElementsAre("home.html", "qivo.html", "page"));
    EXPECT_EQ(segues.count(), 1);
}

/// Keeps the graphics driver mapped until the process ends, so that a leak check can name what the driver left behind.
void pinGraphicsDriver() {
    dl_iterate_phdr(
        [](dl_phdr_info* info, std::size_t, void*) {
            if (std::string(info->dlpi_name).find("_dri.so") != std::string::npos) {
                dlopen(info->dlpi_name, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE);
            }
            return 0;
        },
        nullptr);
}

/// A user in front of the window.
class UserTest : public InterfaceTest {
  protected:
    void SetUp() override {
        InterfaceTest::SetUp();
        screen = test::Screen::open();
        ASSERT_TRUE(screen);
        fake.setSources(
            {{"STAGE (Wide)", "fake://wide"}, {"STUDIO (Cam 1)", "fake://1"}, {"STUDIO (Cam 2)", "fake://2"}});
        window().move(60, 60);
        window().show();
        ASSERT_TRUE(runUntil([&] { return window().isActiveWindow() && screen->findWindow("QIVO Viewer"); }));
        onScreen = screen->findWindow("QIVO Viewer").value();
        ASSERT_TRUE(runUntil([&] { return screen->largestChild(onScreen).has_value(); }));
    }

    void TearDown() override {
        pinGraphicsDriver();
        window().close();
        screen.reset();
        InterfaceTest::TearDown();
    }

    bool key(const char* chord, const std::function<bool()>& effect) {
        return screen->key(chord) && runUntil(effect, std::chrono::seconds(5));
    }

    void clickPicture() {
        const auto picture = screen->largestChild(onScreen);
        ASSERT_TRUE(picture);
        screen->click(picture->x + picture->width / 2, picture->y + picture->height / 2);
        runUntil([] { return false; }, std::chrono::milliseconds(200));
    }

    /// Until the window manager has done its part, keys may go nowhere.
    bool fillsScreen() {
        return runUntil([&] { return window().isActiveWindow() && window().size() == window().screen()->size(); });
    }

    /// Opens the sources by key, and chooses the second one of the second machine with the arrows.
    void chooseSecondCameraByKeyboard() {
        QIVOFileMenu* menu = interface->delegate().qivoSourcesMenu();
        ASSERT_TRUE(key("Alt+s", [&] { return menu->isVisible(); }));
        ASSERT_EQ(menu->actions().size(), 2);
        while (menu->activeAction() != menu->actions().at(1)) {
            const QAction* before = menu->activeAction();
            ASSERT_TRUE(key("Down", [&] { return menu->activeAction() != before; }));
        }
        QMenu* machine = menu->activeAction()->menu();
        ASSERT_TRUE(key("Right", [&] { return machine->isVisible() && machine->activeAction() != nullptr; }));
        ASSERT_TRUE(key("Down", [&] { return machine->activeAction() == machine->actions().at(1); }));
        ASSERT_TRUE(key("Return", [&] { return !menu->isVisible(); }));
        EXPECT_TRUE(runUntil([&] { return model.selectedQIVOSourceName() == "STUDIO (Cam 2)"; }));
    }

    void expectKeysToWork() {
        model.setMute(false);
        EXPECT_TRUE(key("Control+m", [&] { return model.mute(); }));
        EXPECT_TRUE(key("Control+l", [&] { return model.isLowBandwidth(); }));
        EXPECT_TRUE(key("Control+l", [&] { return !model.isLowBandwidth(); }));
        model.setQIVOSourceInfoNamed("none", "fake://none");
        chooseSecondCameraByKeyboard();
    }

    std::unique_ptr<test::Screen> screen;
    test::Window onScreen;
};

TEST_F(UserTest, SourceIsChosenByKeyboardAndNamesTheWindow) {
    chooseSecondCameraByKeyboard();
    EXPECT_EQ(model.selectedQIVOSourceURL(), "fake://2");
    EXPECT_TRUE(runUntil([&] { return screen->findWindow("STUDIO (Cam 2)").has_value(); }));
}

TEST_F(UserTest, SourceIsChosenByMouse) {
    QIVOFileMenu* menu = interface->delegate().qivoSourcesMenu();
    const auto clickOn = [&](const QWidget* widget, const QRect& place) {
        const QPoint at = widget->mapToGlobal(place.center());
        screen->click(at.x(), at.y());
    };
    clickOn(window().menuBar(), window().menuBar()->actionGeometry(menu->menuAction()));
    ASSERT_TRUE(runUntil([&] { return menu->isVisible(); }));
    QMenu* machine = menu->actions().at(0)->menu();
    clickOn(menu, menu->actionGeometry(menu->actions().at(0)));
    ASSERT_TRUE(runUntil([&] { return machine->isVisible(); }));
    clickOn(machine, machine->actionGeometry(machine->actions().at(0)));
    EXPECT_TRUE(runUntil([&] { return model.selectedQIVOSourceName() == "STAGE (Wide)"; }));
}

TEST_F(UserTest, MenusAndShortcutsWorkAfterAClickOnThePicture) {
    clickPicture();
    expectKeysToWork();
}

TEST_F(UserTest, FullScreenIsEnteredAndLeftByKey) {
    EXPECT_TRUE(key("F11", [&] { return window().isFullScreen(); }));
    EXPECT_TRUE(action("actionFullScreen")->isChecked());
    EXPECT_TRUE(runUntil([&] { return window().menuBar()->height() == 0; }));
    EXPECT_TRUE(fillsScreen());
    EXPECT_TRUE(key("Escape", [&] { return !window().isFullScreen(); }));
    EXPECT_TRUE(runUntil([&] { return window().menuBar()->height() > 0; }));
    EXPECT_FALSE(action("actionFullScreen")->isChecked());
    EXPECT_TRUE(runUntil([&] { return window().isActiveWindow() && window().size() != window().screen()->size(); }));
    EXPECT_TRUE(key("F11", [&] { return window().isFullScreen(); }));
    EXPECT_TRUE(fillsScreen());
    EXPECT_TRUE(key("F11", [&] { return !window().isFullScreen(); }));
}

TEST_F(UserTest, EscapeOutsideFullScreenDoesNothing) {
    EXPECT_FALSE(action("actionLeaveFullScreen")->isEnabled());
    EXPECT_TRUE(screen->key("Escape"));
    EXPECT_TRUE(key("Control+m", [&] { return model.mute(); }));
    EXPECT_TRUE(window().isVisible());
}

TEST_F(UserTest, MenusAndShortcutsWorkInFullScreenAlsoAfterAClickOnThePicture) {
    ASSERT_TRUE(key("F11", [&] { return window().isFullScreen(); }));
    ASSERT_TRUE(fillsScreen());
    expectKeysToWork();
    clickPicture();
    expectKeysToWork();
    EXPECT_TRUE(window().isFullScreen());
    EXPECT_TRUE(key("Escape", [&] { return !window().isFullScreen(); }));
}

TEST_F(UserTest, MenuBarComesBackAtTheUpperEdgeOfAFullScreen) {
    screen->moveTo(400, 400);
    ASSERT_TRUE(key("F11", [&] { return window().isFullScreen() && window().menuBar()->height() == 0; }));
    screen->moveTo(400, 0);
    EXPECT_TRUE(runUntil([&] { return window().menuBar()->height() > 0; }, std::chrono::seconds(5)));
    screen->moveTo(400, 400);
    EXPECT_TRUE(runUntil([&] { return window().menuBar()->height() == 0; }, std::chrono::seconds(5)));
}

TEST_F(UserTest, SwitchIsClicked) {
    EXPECT_GE(button("muteSwitch")->height(), 16);
    const QPoint at = button("muteSwitch")->mapToGlobal(button("muteSwitch")->rect().center());
    screen->click(at.x(), at.y());
    EXPECT_TRUE(runUntil([&] { return model.mute() && button("muteSwitch")->isChecked(); }));
}

TEST_F(UserTest, AreaOfThePictureIsBlackBeforeAnySource) {
    const auto picture = screen->largestChild(onScreen);
    ASSERT_TRUE(picture);
    EXPECT_TRUE(runUntil([&] {
        const auto shot = screen->grab(*picture);
        if (shot.empty()) {
            return false;
        }
        const auto middle = shot.at(shot.width / 2, shot.height / 2);
        return middle.red == 0 && middle.green == 0 && middle.blue == 0;
    }));
}

TEST_F(UserTest, ClosingTheWindowWhileReceivingEndsRecordingThenTheReceiver) {
    model.setQIVOSourceInfoNamed("STAGE (Wide)", "fake://wide");
    ASSERT_TRUE(runUntil([&] { return fake.openReceivers() == 1; }));
    model.setIsRecording(true);
    int receiversWhenRecordingEnded = -1;
    QObject context;
    QObject::connect(&model, &AppData::isRecordingChanged, &context,
                     [&] { receiversWhenRecordingEnded = fake.openReceivers(); });
    screen->close(onScreen);
    EXPECT_TRUE(runUntil([&] { return !window().isVisible(); }));
    EXPECT_EQ(receiversWhenRecordingEnded, 1);
    EXPECT_FALSE(model.isRecording());
    EXPECT_EQ(fake.openReceivers(), 0);
}

TEST_F(UserTest, InterfaceThatGoesWhileItReceivesTakesTheReceiverAlong) {
    model.setQIVOSourceInfoNamed("STAGE (Wide)", "fake://wide");
    ASSERT_TRUE(runUntil([&] { return fake.openReceivers() == 1; }));
    pinGraphicsDriver();
    interface.reset();
    EXPECT_EQ(fake.openReceivers(), 0);
    EXPECT_EQ(fake.calls().back(), "destroy()");
    interface = std::make_unique<Interface>(); // what the test ends with
}

/// The panel that steers the camera, opened from the window.
class PanelTest : public UserTest {
  protected:
    void TearDown() override {
        UserTest::TearDown();
        model.setPtzSource(nullptr);
    }

    /// The source tells that it is a camera, and the video view publishes its receiver.
    void connectToCamera() {
        fake.setWebControl("http://camera/");
        fake.setPtzSupported(true);
        fake.addStatusChange();
        model.setQIVOSourceInfoNamed("STAGE (Wide)", "fake://wide");
        ASSERT_TRUE(runUntil([&] { return model.hasPTZControl(); }));
    }

    void openPanel() {
        // The keyboard comes back from a panel that has closed.
        ASSERT_TRUE(runUntil([] { return QApplication::activeWindow() != nullptr; }));
        ASSERT_TRUE(key("Control+k", [&] { return interface->ptzPanel() && interface->ptzPanel()->isActiveWindow(); }));
    }

    bool panelIsShown() const { return screen->findWindow("Camera Control").has_value(); }
};

TEST_F(PanelTest, CommandOpensOnePanelAndBringsItToTheFrontWhenAskedAgain) {
    EXPECT_EQ(interface->ptzPanel(), nullptr);
    ASSERT_NO_FATAL_FAILURE(openPanel());
    const QPointer<PTZPanel> panel = interface->ptzPanel();
    screen->activate(onScreen);
    ASSERT_TRUE(runUntil([&] { return window().isActiveWindow(); }));
    ASSERT_NO_FATAL_FAILURE(openPanel());
    EXPECT_EQ(interface->ptzPanel(), panel);
    const auto titles = screen->titles();
    EXPECT_EQ(std::count(titles.begin(), titles.end(), "Camera Control"), 1);
}

TEST_F(PanelTest, PanelThatWasClosedOpensAnew) {
    ASSERT_NO_FATAL_FAILURE(openPanel());
    const QPointer<PTZPanel> first = interface->ptzPanel();
    EXPECT_TRUE(key("Escape", [&] { return interface->ptzPanel() == nullptr && first.isNull(); }));
    ASSERT_NO_FATAL_FAILURE(openPanel());
    interface->ptzPanel()->close();
    action("actionCameraControl")->trigger(); // before the closed one has gone
    EXPECT_NE(interface->ptzPanel(), nullptr);
}

TEST_F(PanelTest, PictureStaysVisibleBesideThePanel) {
    fake.addVideo(64, 36, 0xff0000ff, 16.0F / 9.0F);
    ASSERT_NO_FATAL_FAILURE(connectToCamera());
    const auto isRed = [&] {
        const auto picture = screen->largestChild(onScreen);
        const auto shot = picture ? screen->grab(*picture) : test::Picture();
        return !shot.empty() && shot.at(shot.width / 2, shot.height / 2).red == 255;
    };
    ASSERT_TRUE(runUntil(isRed));
    ASSERT_NO_FATAL_FAILURE(openPanel());
    runUntil([] { return false; }, std::chrono::milliseconds(200));
    EXPECT_TRUE(runUntil(isRed, std::chrono::seconds(5)));
}

TEST_F(PanelTest, OtherSeguesOpenNothing) {
    interface->viewController().performSegue("OtherSegue", nullptr);
    EXPECT_EQ(interface->ptzPanel(), nullptr);
}

TEST_F(PanelTest, AnotherSourceChosenClosesThePanel) {
    ASSERT_NO_FATAL_FAILURE(connectToCamera());
    ASSERT_NO_FATAL_FAILURE(openPanel());
    screen->activate(onScreen);
    ASSERT_TRUE(runUntil([&] { return window().isActiveWindow(); }));
    chooseSecondCameraByKeyboard();
    EXPECT_TRUE(runUntil([&] { return interface->ptzPanel() == nullptr && !panelIsShown(); }));
}

TEST_F(PanelTest, ClosingTheWindowClosesThePanelOfACamera) {
    ASSERT_NO_FATAL_FAILURE(connectToCamera());
    ASSERT_NO_FATAL_FAILURE(openPanel());
    window().close();
    EXPECT_TRUE(runUntil([&] { return interface->ptzPanel() == nullptr && !panelIsShown(); }));
}

TEST_F(PanelTest, ClosingTheWindowClosesThePanelWithoutACameraToo) {
    ASSERT_NO_FATAL_FAILURE(openPanel());
    window().close();
    EXPECT_TRUE(runUntil([&] { return interface->ptzPanel() == nullptr && !panelIsShown(); }));
}

TEST_F(PanelTest, TerminationClosesThePanel) {
    bool wasOpen = true;
    // Where the application connects the controller's termination.
    QObject::connect(qApp, &QCoreApplication::aboutToQuit, &window(),
                     [&] { wasOpen = interface->ptzPanel() != nullptr; });
    ASSERT_NO_FATAL_FAILURE(openPanel());
    QMetaObject::invokeMethod(qApp, &Interface::terminate, Qt::QueuedConnection);
    EXPECT_EQ(QCoreApplication::exec(), 0);
    EXPECT_EQ(interface->ptzPanel(), nullptr);
    EXPECT_FALSE(wasOpen) << "a camera moves on while a recording ends";
    EXPECT_TRUE(window().isVisible()) << "the window goes with the interface";
}

TEST_F(PanelTest, KeysOfTheWindowWorkInThePanelAndDoNotClashWithItsOwn) {
    ASSERT_NO_FATAL_FAILURE(openPanel());
    EXPECT_TRUE(key("Control+m", [&] { return model.mute(); }));
    EXPECT_TRUE(
        key("Alt+t", [&] { return interface->ptzPanel()->findChild<QAbstractButton*>("storePreset")->isChecked(); }));
    EXPECT_TRUE(key("F11", [&] { return window().isFullScreen(); }));
    ASSERT_NO_FATAL_FAILURE(openPanel());
    EXPECT_TRUE(key("Escape", [&] { return !window().isFullScreen(); }));
    EXPECT_NE(interface->ptzPanel(), nullptr) << "Escape left the full screen first";
}

TEST_F(PanelTest, LowBandwidthToggledSteersTheNewReceiverOnceItIsKnown) {
    ASSERT_NO_FATAL_FAILURE(connectToCamera());
    ASSERT_NO_FATAL_FAILURE(openPanel());
    const auto first = model.ptzSource();
    ASSERT_TRUE(key("Control+l", [&] { return model.isLowBandwidth(); }));
    ASSERT_TRUE(runUntil([&] {
        return !fake.callsOf("recv_create_v3(name=STAGE (Wide), url=fake://wide, color=2, bandwidth=0").empty();
    }));
    EXPECT_EQ(model.ptzSource(), first) << "the library refuses it";
    EXPECT_NE(interface->ptzPanel(), nullptr);
    fake.addStatusChange();
    ASSERT_TRUE(runUntil([&] { return model.ptzSource() != first; }));
    // The view may have connected before the source was chosen: to what was chosen in an earlier case.
    const std::string newest = "r" + std::to_string(fake.callsOf("recv_create_v3").size());
    EXPECT_TRUE(key("5", [&] { return !fake.callsOf("recv_ptz_recall_preset(" + newest + ", 5, 0.25)").empty(); }));
}

/// Two screens of different scale, side by side.
class TwoScreensTest : public UserTest {
  protected:
    static void SetUpTestSuite() {
        s_screensExist = xrandr({"--setmonitor", "LEFT", "640/170x1024/270+0+0", "screen"}) &&
                         xrandr({"--setmonitor", "RIGHT", "640/170x1024/270+640+0", "none"});
        restartWindowManager();
        qputenv("QT_SCREEN_SCALE_FACTORS", "1;2");
        UserTest::SetUpTestSuite();
    }

    static void TearDownTestSuite() {
        UserTest::TearDownTestSuite();
        qunsetenv("QT_SCREEN_SCALE_FACTORS");
        xrandr({"--delmonitor", "LEFT"});
        xrandr({"--delmonitor", "RIGHT"});
    }

    static bool xrandr(const QStringList& arguments) { return QProcess::execute("xrandr", arguments) == 0; }

    /// It knows of the screens that it found when it began.
    static void restartWindowManager() {
        xprop({"-remove", "_NET_SUPPORTING_WM_CHECK"});
        QProcess::execute("openbox", {"--restart"});
        runUntil([] { return xprop({"_NET_SUPPORTING_WM_CHECK"}).contains("window id"); });
    }

    static QByteArray xprop(const QStringList& arguments) {
        QProcess process;
        process.start("xprop", QStringList{"-root"} + arguments);
        process.waitForFinished();
        return process.readAllStandardOutput();
    }

    static bool s_screensExist;
};

bool TwoScreensTest::s_screensExist = false;

TEST_F(TwoScreensTest, MenuBarOfAFullScreenGoesWithThePointerToAnotherScreenAndStaysAwayThere) {
    if (!s_screensExist) {
        GTEST_SKIP() << "xrandr cannot divide this screen";
    }
    window().resize(window().minimumSize());
    ASSERT_TRUE(runUntil([&] { return window().geometry().right() < 640; }));
    screen->moveTo(400, 400);
    ASSERT_TRUE(key("F11", [&] { return window().isFullScreen() && window().menuBar()->height() == 0; }));
    ASSERT_TRUE(runUntil([&] { return window().width() == 640; })) << window().width() << ": one screen is not full";
    screen->moveTo(400, 0);
    ASSERT_TRUE(runUntil([&] { return window().menuBar()->height() > 0; }, std::chrono::seconds(5)));
    screen->moveTo(900, 0);
    EXPECT_TRUE(runUntil([&] { return window().menuBar()->height() == 0; }, std::chrono::seconds(5)));
    screen->moveTo(950, 1);
    QKeyEvent something(QEvent::KeyRelease, Qt::Key_Shift, Qt::NoModifier); // has the window look where the pointer is
    QCoreApplication::sendEvent(&window(), &something);
    EXPECT_EQ(window().menuBar()->maximumHeight(), 0);
    screen->moveTo(400, 1);
    EXPECT_TRUE(runUntil([&] { return window().menuBar()->height() > 0; }, std::chrono::seconds(5)));
}

TEST_F(TwoScreensTest, MenusAndShortcutsWorkAfterTheWindowHasMovedToAScreenWithAnotherScale) {
    if (!s_screensExist) {
        GTEST_SKIP() << "xrandr cannot divide this screen";
    }
    ASSERT_EQ(QGuiApplication::screens().size(), 2);
    window().resize(window().minimumSize());
    ASSERT_EQ(window().devicePixelRatio(), 1);
    expectKeysToWork();
    const auto title = window().windowTitle().toStdString();
    screen->move(screen->findWindow(title).value(), 660, 60);
    ASSERT_TRUE(runUntil([&] { return window().devicePixelRatio() == 2; }));
    expectKeysToWork();
    clickPicture();
    expectKeysToWork();
}

} // namespace
} // namespace qivo

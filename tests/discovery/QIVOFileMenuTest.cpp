#include "discovery/QIVOFileMenu.h"

#include "tests/fake/FakeQivo.h"

#include <QApplication>
#include <QMainWindow>
#include <QMenuBar>
#include <QSignalSpy>
#include <QTest>

#include <gmock/gmock.h>
#include <limits>
#include <memory>

namespace qivo {
namespace {

using test::FakeQivo;
using testing::ElementsAre;
using testing::IsEmpty;

/// Submenus as "title{...}", other items as "title=tag", disabled ones in brackets.
std::string describe(const QMenu& menu) {
    std::string text;
    for (const QAction* item : menu.actions()) {
        text += text.empty() ? "" : ", ";
        const std::string title = QIVOFileMenu::titleOf(item).toStdString();
        const std::string tag = "=" + std::to_string(item->data().toInt());
        const std::string whole = item->menu() != nullptr ? title + "{" + describe(*item->menu()) + "}" : title + tag;
        text += item->isEnabled() ? whole : "[" + whole + "]";
    }
    return text;
}

class QIVOFileMenuTest : public testing::Test {
  protected:
    static void SetUpTestSuite() {
        static int count = 1;
        static char name[] = "menu-test";           // NOLINT(modernize-avoid-c-arrays): argv is an array
        static char* arguments[] = {name, nullptr}; // NOLINT(modernize-avoid-c-arrays)
        s_application = std::make_unique<QApplication>(count, static_cast<char**>(arguments));
    }
    static void TearDownTestSuite() { s_application.reset(); }

    void SetUp() override { fake.reset(); }
    void TearDown() override {
        EXPECT_THAT(fake.misuse(), IsEmpty());
        fake.reset();
    }

    void announce(const std::vector<std::string>& names) {
        std::vector<FakeQivo::Source> sources;
        for (const std::string& name : names) {
            sources.push_back({name, "fake://" + name});
        }
        fake.setSources(std::move(sources));
    }

    std::string after(QIVOFileMenu& menu, const std::vector<std::string>& names) {
        announce(names);
        menu.updateMenu();
        return describe(menu);
    }

    FakeQivo& fake = FakeQivo::instance();

  private:
    static std::unique_ptr<QApplication> s_application;
};

std::unique_ptr<QApplication> QIVOFileMenuTest::s_application;

TEST_F(QIVOFileMenuTest, DiscoveryStartsAsSoonAsTheMenuExists) {
    const QIVOFileMenu menu("Sources");
    EXPECT_EQ(menu.title(), "Sources");
    EXPECT_THAT(fake.calls(), ElementsAre("find_create_v2(local=1, groups=null, ips=null)"));
}

TEST_F(QIVOFileMenuTest, FinderIsMadeOnlyOnce) {
    QIVOFileMenu menu;
    EXPECT_TRUE(menu.createQIVOFinder());
    menu.applicationDidFinishLaunching();
    EXPECT_THAT(fake.callsOf("find_create_v2"), testing::SizeIs(1));
}

TEST_F(QIVOFileMenuTest, FinderThatCannotBeMadeIsTriedAgainOnEveryUpdate) {
    fake.setFinderCreates(false);
    QIVOFileMenu menu;
    menu.addAction("kept");
    QSignalSpy updated(&menu, &QIVOFileMenu::updated);
    EXPECT_FALSE(menu.createQIVOFinder());
    EXPECT_EQ(after(menu, {"A"}), "kept=0");
    EXPECT_EQ(updated.count(), 1) << "items are validated all the same";
    EXPECT_THAT(fake.callsOf("find_wait_for_sources"), IsEmpty());
    fake.setFinderCreates(true);
    menu.updateMenu();
    EXPECT_EQ(describe(menu), "A=0");
}

TEST_F(QIVOFileMenuTest, SourcesOfOneMachineAreOneSubmenuWithTagsFromZero) {
    QIVOFileMenu menu;
    EXPECT_EQ(after(menu, {"STUDIO (Cam 1)", "STUDIO (Cam 2)"}), "STUDIO{Cam 1=0, Cam 2=1}");
}

TEST_F(QIVOFileMenuTest, MachineWhoseSourcesAreApartGetsTwoSubmenus) {
    QIVOFileMenu menu;
    EXPECT_EQ(after(menu, {"A (x)", "B (y)", "A (z)"}), "A{x=0}, B{y=1}, A{z=2}");
}

TEST_F(QIVOFileMenuTest, PlainNamesAndNestedNamesStandWhereTheyBelong) {
    QIVOFileMenu menu;
    EXPECT_EQ(after(menu, {"PLAIN", "A(x)", "A (", "A ()", "A (x", "A (x) extra", "B (C (E))"}),
              "PLAIN=0, A(x)=1, A (=2, A ()=3, A (x=4, A{x=5}, B{C{E=6}}");
}

TEST_F(QIVOFileMenuTest, LeafThatBecameAMachineIsReachedThroughItsFirstChild) {
    QIVOFileMenu menu;
    EXPECT_EQ(after(menu, {"A", "A (x)"}), "A{x=0}");
    QString name;
    QString url;
    EXPECT_TRUE(menu.getQIVOFinderInfoAt(0, name, url));
    EXPECT_EQ(name, "A");
}

TEST_F(QIVOFileMenuTest, UpdatePollsWithoutWaitingAndLeavesTheItemsWhenNothingChanged) {
    QIVOFileMenu menu;
    menu.addAction("from the interface file");
    fake.takeCalls();
    menu.updateMenu();
    EXPECT_THAT(fake.takeCalls(), ElementsAre("find_wait_for_sources(f1, timeout=0) -> 0"));
    EXPECT_EQ(describe(menu), "from the interface file=0");
    EXPECT_EQ(after(menu, {"A (x)"}), "A{x=0}");
    const QAction* before = menu.actions().at(0);
    menu.updateMenu();
    EXPECT_EQ(menu.actions().at(0), before);
}

TEST_F(QIVOFileMenuTest, NoChangeKeepsThePlaceholderToo) {
    QIVOFileMenu menu;
    after(menu, {});
    const QAction* before = menu.actions().at(0);
    menu.updateMenu();
    EXPECT_EQ(describe(menu), "[No Sources Found Yet=-1]");
    EXPECT_EQ(menu.actions().at(0), before);
}

TEST_F(QIVOFileMenuTest, EmptyListAfterSourcesLeavesOnlyThePlaceholder) {
    QIVOFileMenu menu;
    after(menu, {"A (x)", "B"});
    EXPECT_EQ(after(menu, {}), "[No Sources Found Yet=-1]");
    EXPECT_EQ(after(menu, {"B"}), "B=0");
}

TEST_F(QIVOFileMenuTest, IndexOutOfRangeIsRefusedAndTouchesNothing) {
    QIVOFileMenu menu;
    QString name = "name before";
    QString url = "url before";
    EXPECT_FALSE(menu.getQIVOFinderInfoAt(0, name, url));
    after(menu, {"A", "B"});
    for (const int index : {-1, 2, std::numeric_limits<int>::max(), std::numeric_limits<int>::min()}) {
        EXPECT_FALSE(menu.getQIVOFinderInfoAt(index, name, url)) << index;
    }
    EXPECT_EQ(name, "name before");
    EXPECT_EQ(url, "url before");
    EXPECT_TRUE(menu.getQIVOFinderInfoAt(1, name, url));
    EXPECT_EQ(name, "B");
    EXPECT_EQ(url, "fake://B");
}

TEST_F(QIVOFileMenuTest, ChosenItemIsAnnouncedWithItsTag) {
    QIVOFileMenu menu;
    after(menu, {"A (x)", "A (y)", "B"});
    std::vector<int> chosen;
    QObject::connect(&menu, &QIVOFileMenu::handleSelQIVOSource, &menu,
                     [&](const QAction* item) { chosen.push_back(item->data().toInt()); });
    menu.actions().at(0)->menu()->actions().at(1)->trigger();
    menu.performActionForItemAtIndex(1);
    menu.performActionForItemAtIndex(2);
    menu.performActionForItemAtIndex(-1);
    EXPECT_THAT(chosen, ElementsAre(1, 2));
}

TEST_F(QIVOFileMenuTest, TitlesAreShownLiterally) {
    QIVOFileMenu menu;
    after(menu, {"R&D (A && B\tC\nD)"});
    const QAction* machine = menu.actions().at(0);
    EXPECT_EQ(machine->text(), "R&&D");
    EXPECT_EQ(QIVOFileMenu::titleOf(machine), "R&D");
    const QAction* source = machine->menu()->actions().at(0);
    EXPECT_EQ(source->text(), "A &&&& B C D");
    EXPECT_EQ(QIVOFileMenu::titleOf(source), "A && B\tC\nD");
}

TEST_F(QIVOFileMenuTest, HiddenMarksThatWouldDisguiseATitleAreShown) {
    QIVOFileMenu menu;
    const QString turned = QStringLiteral("CAM\u202e1\u2066\u200b\u2028") + QString::fromUcs4(U"\U000e0041");
    after(menu, {turned.toStdString()});
    const QAction* source = menu.actions().at(0);
    EXPECT_EQ(source->text(), QStringLiteral("CAM\ufffd1\ufffd\ufffd \ufffd"));
    EXPECT_EQ(QIVOFileMenu::titleOf(source), turned);
    QString name;
    QString url;
    ASSERT_TRUE(menu.getQIVOFinderInfoAt(0, name, url));
    EXPECT_EQ(name, turned) << "the library knows it by its own name";
}

TEST_F(QIVOFileMenuTest, MarksThatWordsAndPicturesNeedAreLeft) {
    QIVOFileMenu menu;
    const QString title =
        QStringLiteral("\u0645\u06cc\u200c\u062e ") + QString::fromUcs4(U"\U0001F468\u200d\U0001F4BB");
    after(menu, {title.toStdString()});
    EXPECT_EQ(menu.actions().at(0)->text(), title);
}

TEST_F(QIVOFileMenuTest, NameAndAddressThatTheLibraryLeavesOutAreEmpty) {
    QIVOFileMenu menu;
    fake.setSources({{std::nullopt, std::nullopt}, {std::nullopt, "fake://1"}, {"B", std::nullopt}});
    menu.updateMenu();
    EXPECT_EQ(describe(menu), "=0, =1, B=2");
    QString name = "before";
    QString url = "before";
    ASSERT_TRUE(menu.getQIVOFinderInfoAt(0, name, url));
    EXPECT_TRUE(name.isNull() && url.isNull());
    ASSERT_TRUE(menu.getQIVOFinderInfoAt(1, name, url));
    EXPECT_TRUE(name.isNull());
    EXPECT_EQ(url, "fake://1");
    ASSERT_TRUE(menu.getQIVOFinderInfoAt(2, name, url));
    EXPECT_EQ(name, "B");
    EXPECT_TRUE(url.isNull());
}

TEST_F(QIVOFileMenuTest, TitleWithoutEndIsShownUpToTheLimit) {
    QIVOFileMenu menu;
    const std::string name(QIVOFileMenu::kLongestTitle + 1, 'x');
    after(menu, {name.substr(1), name});
    EXPECT_EQ(menu.actions().at(0)->text().size(), QIVOFileMenu::kLongestTitle);
    EXPECT_EQ(menu.actions().at(1)->text().size(), QIVOFileMenu::kLongestTitle + 1);
    EXPECT_TRUE(menu.actions().at(1)->text().endsWith(QChar(0x2026)));
}

TEST_F(QIVOFileMenuTest, TerminationEndsTheFinderAndTheList) {
    QIVOFileMenu menu;
    after(menu, {"A"});
    menu.applicationWillTerminate();
    EXPECT_EQ(fake.openFinders(), 0);
    QString name;
    QString url;
    EXPECT_FALSE(menu.getQIVOFinderInfoAt(0, name, url));
    fake.takeCalls();
    menu.applicationWillTerminate();
    QTest::qWait(QIVOFileMenu::kClosedIntervalMs + 200);
    EXPECT_THAT(fake.calls(), IsEmpty()) << "no refresh looks for sources any more";
}

TEST_F(QIVOFileMenuTest, MenuThatGoesEndsItsFinder) {
    { const QIVOFileMenu menu; }
    EXPECT_THAT(fake.calls(), ElementsAre("find_create_v2(local=1, groups=null, ips=null)", "find_destroy(f1)"));
}

TEST_F(QIVOFileMenuTest, ClosedMenuLearnsOfSourcesByItself) {
    const QIVOFileMenu menu;
    announce({"A"});
    EXPECT_TRUE(QTest::qWaitFor([&] { return describe(menu) == "A=0"; }, 10000));
}

/// A menu bar in a window with the menu in it, and keys that go where the keyboard is.
class OpenMenuTest : public QIVOFileMenuTest {
  protected:
    void SetUp() override {
        QIVOFileMenuTest::SetUp();
        window = std::make_unique<QMainWindow>();
        menu = new QIVOFileMenu("&Sources", window.get());
        window->menuBar()->addMenu(menu);
        QObject::connect(menu, &QIVOFileMenu::handleSelQIVOSource, menu, [this](const QAction* item) {
            QString name;
            QString url;
            ASSERT_TRUE(menu->getQIVOFinderInfoAt(item->data().toInt(), name, url));
            chosen.push_back(name.toStdString());
        });
        window->resize(400, 300);
        window->show();
        ASSERT_TRUE(QTest::qWaitForWindowActive(window.get()));
    }

    void TearDown() override {
        window.reset();
        QIVOFileMenuTest::TearDown();
    }

    void open() {
        QTest::keyClick(window.get(), Qt::Key_S, Qt::AltModifier);
        ASSERT_TRUE(QTest::qWaitFor([this] { return menu->isVisible(); }));
    }

    static void key(Qt::Key key) {
        ASSERT_NE(QApplication::activePopupWidget(), nullptr);
        QTest::keyClick(QApplication::activePopupWidget(), key);
    }

    /// Titles of the highlighted entries from the menu down.
    std::string highlighted() const {
        std::string path;
        for (const QMenu* at = menu; at != nullptr && at->isVisible() && at->activeAction() != nullptr;) {
            path += "/" + QIVOFileMenu::titleOf(at->activeAction()).toStdString();
            at = at->activeAction()->menu();
        }
        return path;
    }

    bool shows(const std::string& description) {
        return QTest::qWaitFor([&] { return describe(*menu) == description; }, 10000);
    }

    std::unique_ptr<QMainWindow> window;
    QIVOFileMenu* menu = nullptr; // the window's
    std::vector<std::string> chosen;
};

TEST_F(OpenMenuTest, OpeningByKeyShowsWhatTheFinderKnowsNow) {
    announce({"A (x)", "B (y)"});
    open();
    EXPECT_EQ(describe(*menu), "A{x=0}, B{y=1}");
}

TEST_F(OpenMenuTest, ArrowKeysAndEnterChoose) {
    announce({"A (x)", "B (y)", "B (z)"});
    open();
    while (highlighted() != "/B") {
        key(Qt::Key_Down);
    }
    key(Qt::Key_Right);
    EXPECT_EQ(highlighted(), "/B/y");
    key(Qt::Key_Down);
    key(Qt::Key_Return);
    EXPECT_THAT(chosen, ElementsAre("B (z)"));
    EXPECT_FALSE(menu->isVisible());
}

TEST_F(OpenMenuTest, OpenMenuFollowsTheNetworkAndKeepsTheHighlightedEntry) {
    announce({"B (y)", "C"});
    open();
    while (highlighted() != "/C") {
        key(Qt::Key_Down);
    }
    announce({"A", "B (y)", "C", "D"});
    ASSERT_TRUE(shows("A=0, B{y=1}, C=2, D=3"));
    EXPECT_EQ(highlighted(), "/C");
    EXPECT_TRUE(menu->isVisible());
    key(Qt::Key_Return);
    EXPECT_THAT(chosen, ElementsAre("C"));
}

TEST_F(OpenMenuTest, OpenSubmenuSurvivesARebuildAndStillChoosesTheRightSource) {
    announce({"B (y)", "B (z)"});
    open();
    while (highlighted() != "/B") {
        key(Qt::Key_Down);
    }
    key(Qt::Key_Right);
    key(Qt::Key_Down);
    ASSERT_EQ(highlighted(), "/B/z");
    announce({"A (x)", "B (w)", "B (y)", "B (z)"});
    ASSERT_TRUE(shows("A{x=0}, B{w=1, y=2, z=3}"));
    EXPECT_EQ(highlighted(), "/B/z");
    key(Qt::Key_Return);
    EXPECT_THAT(chosen, ElementsAre("B (z)"));
}

TEST_F(OpenMenuTest, SourceThatVanishesWhileItIsHighlightedCannotBeChosen) {
    announce({"A", "B (y)"});
    open();
    while (highlighted() != "/B") {
        key(Qt::Key_Down);
    }
    key(Qt::Key_Right);
    ASSERT_EQ(highlighted(), "/B/y");
    announce({"A"});
    ASSERT_TRUE(shows("A=0"));
    ASSERT_TRUE(menu->isVisible());
    EXPECT_EQ(highlighted(), "");
    key(Qt::Key_Return);
    EXPECT_THAT(chosen, IsEmpty());
}

TEST_F(OpenMenuTest, SecondMachineOfTheSameTitleStaysTheHighlightedOne) {
    announce({"A (x)", "B (y)", "A (z)"});
    open();
    while (menu->activeAction() != menu->actions().at(2)) {
        key(Qt::Key_Down);
    }
    key(Qt::Key_Right);
    ASSERT_EQ(highlighted(), "/A/z");
    announce({"A (x)", "B (y)", "A (z)", "C"});
    ASSERT_TRUE(shows("A{x=0}, B{y=1}, A{z=2}, C=3"));
    EXPECT_EQ(highlighted(), "/A/z");
}

TEST_F(OpenMenuTest, ItemUnderAPressedButtonStaysWhatItIs) {
    announce({"A", "B"});
    open();
    const QPoint second = menu->actionGeometry(menu->actions().at(1)).center();
    QTest::mousePress(menu, Qt::LeftButton, Qt::NoModifier, second);
    announce({"0", "1", "A", "B"});
    QTest::qWait(3 * QIVOFileMenu::kOpenIntervalMs);
    EXPECT_EQ(describe(*menu), "A=0, B=1");
    QTest::mouseRelease(menu, Qt::LeftButton, Qt::NoModifier, second);
    EXPECT_THAT(chosen, ElementsAre("B"));
}

TEST_F(OpenMenuTest, LongSubmenuThatIsOpenStaysAsItIsUntilItCloses) {
    std::vector<std::string> names;
    for (int i = 0; i <= QIVOFileMenu::kMostLiveEntries; ++i) {
        names.push_back("A (" + std::to_string(i) + ")");
    }
    announce(names);
    open();
    const QMenu* machine = menu->actions().at(0)->menu();
    menu->setActiveAction(machine->menuAction());
    while (!machine->isVisible()) {
        key(Qt::Key_Right);
    }
    announce({"A (x)", "B (y)"});
    QTest::qWait(3 * QIVOFileMenu::kOpenIntervalMs);
    ASSERT_EQ(menu->actions().size(), 1);
    EXPECT_EQ(menu->actions().at(0)->menu(), machine) << "left as it was";
    key(Qt::Key_Left);
    menu->setActiveAction(nullptr);
    EXPECT_TRUE(shows("A{x=0}, B{y=1}"));
    EXPECT_TRUE(menu->isVisible());
}

TEST_F(OpenMenuTest, LongSubmenuThatIsClosedKeepsNothingUp) {
    std::vector<std::string> names;
    for (int i = 0; i <= QIVOFileMenu::kMostLiveEntries; ++i) {
        names.push_back("A (" + std::to_string(i) + ")");
    }
    announce(names);
    open();
    menu->setActiveAction(nullptr);
    announce({"B (y)"});
    EXPECT_TRUE(shows("B{y=0}"));
}

TEST_F(OpenMenuTest, AThousandChangesOfAnOpenMenuLeaveNothingBehind) {
    open();
    for (int i = 0; i < 1000; ++i) {
        announce(i % 2 == 0 ? std::vector<std::string>{"A (x)", "B (y)"} : std::vector<std::string>{"B (y)", "C"});
        menu->updateMenu();
        if (i % 50 == 0) {
            menu->setActiveAction(menu->actions().at(0));
            QCoreApplication::processEvents();
        }
    }
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    EXPECT_EQ(describe(*menu), "B{y=0}, C=1");
    EXPECT_THAT(menu->findChildren<QMenu*>(), testing::SizeIs(1));
}

} // namespace
} // namespace qivo

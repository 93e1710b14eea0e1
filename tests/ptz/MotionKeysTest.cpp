#include "ptz/MotionKeys.h"

#include "tests/app/ShellFixture.h"

#include <QKeyEvent>
#include <QWidget>
#include <QWindow>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class MotionKeysTest : public test::ShellFixture {
  protected:
    void SetUp() override {
        ShellFixture::SetUp();
        window.show();
        QObject::connect(&keys, &MotionKeys::panTilt, &window, [this](int pan, int tilt) {
            told.push_back(std::to_string(pan) + "," + std::to_string(tilt));
        });
        QObject::connect(&keys, &MotionKeys::zoom, &window, [this](int zoom) { told.push_back(std::to_string(zoom)); });
        QObject::connect(&keys, &MotionKeys::preset, &window,
                         [this](int number) { told.push_back("#" + std::to_string(number)); });
    }

    /// Without a scan code, as an input method or a virtual keyboard sends keys.
    bool send(QEvent::Type type, int key, Qt::KeyboardModifiers modifiers = {}, bool repeats = false,
              quint32 scanCode = 0) {
        QKeyEvent event(type, key, modifiers, scanCode, 0, 0, QString(), repeats);
        return keys.eventFilter(window.windowHandle(), &event);
    }
    bool press(int key, Qt::KeyboardModifiers modifiers = {}) { return send(QEvent::KeyPress, key, modifiers); }
    bool release(int key) { return send(QEvent::KeyRelease, key); }

    class Keys : public MotionKeys {
      public:
        using MotionKeys::eventFilter;
        using MotionKeys::MotionKeys;
    };
    QWidget window;
    Keys keys{&window};
    std::vector<std::string> told;
};

TEST_F(MotionKeysTest, KeysHeldTogetherAddUpAndLetGoOneByOne) {
    press(Qt::Key_Left);
    press(Qt::Key_Up);
    release(Qt::Key_Left);
    release(Qt::Key_Up);
    EXPECT_THAT(told, ElementsAre("1,0", "1,1", "0,1", "0,0"));
}

TEST_F(MotionKeysTest, OppositeKeysCancelEachOther) {
    press(Qt::Key_Left);
    press(Qt::Key_Right);
    release(Qt::Key_Left);
    release(Qt::Key_Right);
    EXPECT_THAT(told, ElementsAre("1,0", "0,0", "-1,0", "0,0"));
}

TEST_F(MotionKeysTest, TwoKeysOfOneDirectionAreNotFaster) {
    send(QEvent::KeyPress, Qt::Key_Plus, {}, false, 21);
    send(QEvent::KeyPress, Qt::Key_Plus, Qt::KeypadModifier, false, 86);
    send(QEvent::KeyRelease, Qt::Key_Plus, {}, false, 21);
    send(QEvent::KeyRelease, Qt::Key_Plus, Qt::KeypadModifier, false, 86);
    EXPECT_THAT(told, ElementsAre("1", "1", "1", "0"));
}

TEST_F(MotionKeysTest, RepeatsAreTakenAndNotTold) {
    press(Qt::Key_Minus);
    EXPECT_TRUE(send(QEvent::KeyRelease, Qt::Key_Minus, {}, true));
    EXPECT_TRUE(send(QEvent::KeyPress, Qt::Key_Minus, {}, true));
    EXPECT_TRUE(send(QEvent::KeyPress, Qt::Key_4, {}, true));
    release(Qt::Key_Minus);
    EXPECT_THAT(told, ElementsAre("-1", "0"));
}

TEST_F(MotionKeysTest, KeyWhoseReleaseWasLostDoesNotHoldTwice) {
    press(Qt::Key_Left);
    press(Qt::Key_Left);
    release(Qt::Key_Left);
    EXPECT_THAT(told, ElementsAre("1,0", "0,0"));
}

TEST_F(MotionKeysTest, RepeatThatBeganElsewhereStartsNothing) {
    EXPECT_TRUE(send(QEvent::KeyPress, Qt::Key_Left, {}, true));
    EXPECT_FALSE(release(Qt::Key_Left));
    EXPECT_THAT(told, IsEmpty());
}

TEST_F(MotionKeysTest, ModifierPressedMeanwhileDoesNotKeepTheKeyHeld) {
    press(Qt::Key_Down);
    EXPECT_TRUE(send(QEvent::KeyRelease, Qt::Key_Down, Qt::ControlModifier));
    EXPECT_THAT(told, ElementsAre("0,-1", "0,0"));
}

TEST_F(MotionKeysTest, HiddenWindowAndLostKeyboardLetAllGoOnce) {
    press(Qt::Key_Right);
    press(Qt::Key_Down);
    press(Qt::Key_Plus);
    told.clear();
    QEvent deactivated(QEvent::WindowDeactivate);
    QCoreApplication::sendEvent(&window, &deactivated);
    EXPECT_THAT(told, ElementsAre("0,0", "0"));
    QEvent hidden(QEvent::Hide);
    QCoreApplication::sendEvent(&window, &hidden);
    EXPECT_THAT(told, ElementsAre("0,0", "0"));
}

TEST_F(MotionKeysTest, OtherKeysAreLeftAlone) {
    for (const int key : {Qt::Key_0, Qt::Key_A, Qt::Key_Tab, Qt::Key_Space, Qt::Key_PageUp, Qt::Key_Escape}) {
        EXPECT_FALSE(press(key));
        EXPECT_FALSE(release(key));
    }
    for (const auto modifier : {Qt::ControlModifier, Qt::AltModifier, Qt::MetaModifier}) {
        EXPECT_FALSE(press(Qt::Key_Left, modifier));
        EXPECT_FALSE(press(Qt::Key_1, modifier));
    }
    EXPECT_THAT(told, IsEmpty());
}

TEST_F(MotionKeysTest, DigitsOfTheKeypadCountToo) {
    EXPECT_TRUE(press(Qt::Key_1));
    EXPECT_TRUE(press(Qt::Key_9, Qt::KeypadModifier));
    EXPECT_THAT(told, ElementsAre("#1", "#9"));
}

} // namespace
} // namespace qivo

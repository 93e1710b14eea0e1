#include "app/Binding.h"

#include "tests/app/ShellFixture.h"

#include <QCheckBox>
#include <QSignalSpy>

namespace qivo {
namespace {

class BindingTest : public test::ShellFixture {
  protected:
    static constexpr SwitchProperty kMute{&AppData::mute, &AppData::setMute, &AppData::muteChanged};
};

TEST_F(BindingTest, ControlBeginsWithTheModelsValue) {
    model.setMute(true);
    QCheckBox control;
    QSignalSpy notices(&model, &AppData::muteChanged);
    bindSwitch(&control, &model, kMute);
    EXPECT_TRUE(control.isChecked());
    EXPECT_EQ(notices.count(), 0);
}

TEST_F(BindingTest, ControlFollowsTheModelWithoutAnswering) {
    QCheckBox control;
    bindSwitch(&control, &model, kMute);
    QSignalSpy notices(&model, &AppData::muteChanged);
    model.setMute(true);
    EXPECT_TRUE(control.isChecked());
    EXPECT_EQ(notices.count(), 1);
}

TEST_F(BindingTest, ModelFollowsTheControlWithOneNotice) {
    QCheckBox control;
    bindSwitch(&control, &model, kMute);
    QSignalSpy notices(&model, &AppData::muteChanged);
    control.click();
    EXPECT_TRUE(model.mute());
    control.click();
    EXPECT_FALSE(model.mute());
    EXPECT_EQ(notices.count(), 2);
}

TEST_F(BindingTest, ChangeOnAnotherThreadReachesTheControlThroughTheEventLoop) {
    QCheckBox control;
    bindSwitch(&control, &model, kMute);
    std::thread([&] { model.setMute(true); }).join();
    EXPECT_FALSE(control.isChecked());
    EXPECT_TRUE(test::runUntil([&] { return control.isChecked(); }));
    EXPECT_TRUE(model.mute());
}

TEST_F(BindingTest, EndsWithTheControl) {
    {
        QCheckBox control;
        bindSwitch(&control, &model, kMute);
    }
    model.setMute(true);
    EXPECT_TRUE(model.mute());
}

} // namespace
} // namespace qivo

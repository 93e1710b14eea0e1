#pragma once

#include "app/AppData.h"
#include "tests/fake/FakeQivo.h"
#include "tests/video/Journal.h"
#include "video/VideoView.h"

#include <QApplication>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <vector>

namespace qivo::test {

/// A view without a window, whose link and context write into a journal.
class ViewUnderTest final : public VideoView {
  public:
    ViewUnderTest(QWidget* parent, Journal& journal) : VideoView(parent), m_journal(journal) {}
    JournalLink* link = nullptr; // the view's

  protected:
    std::unique_ptr<DisplayLink> newDisplayLink() override {
        auto made = std::make_unique<JournalLink>(m_journal);
        link = made.get();
        return made;
    }

  private:
    Journal& m_journal;
};

/// The model with nothing selected, a scripted libqivo, and a view that was prepared.
class ViewFixture : public testing::Test {
  protected:
    using Lines = std::vector<std::string>;
    static constexpr float kWide = 16.0F / 9.0F;
    static constexpr std::uint32_t kRed = 0xff0000ff;

    static void SetUpTestSuite() {
        static int count = 1;
        static char name[] = "video-view-test"; // NOLINT(modernize-avoid-c-arrays): argv is an array
        static char* arguments[] = {name, nullptr};
        qputenv("QT_QPA_PLATFORM", "offscreen");
        s_application = std::make_unique<QApplication>(count, static_cast<char**>(arguments));
    }
    static void TearDownTestSuite() { s_application.reset(); }

    void SetUp() override {
        fake.reset();
        model->setQIVOSourceInfoNamed(QString(), QString());
        model->setSelectedQIVOSourceChangedCount(0);
        model->setIsLowBandwidth(false);
        model->setDeviceWebpageURL(QString());
        journal = std::make_unique<Journal>();
        view = std::make_unique<ViewUnderTest>(nullptr, *journal);
        view->resize(1920, 1080);
    }

    void TearDown() override {
        view.reset();
        journal.reset();
        EXPECT_EQ(fake.misuse(), Lines());
        EXPECT_EQ(fake.openReceivers(), 0);
        EXPECT_EQ(fake.framesOut(), 0);
        EXPECT_EQ(fake.stringsOut(), 0);
        fake.reset();
    }

    /// As the platform prepares a view; forgets what that did.
    void prepare() {
        view->setOpenGLContext(std::make_shared<JournalContext>(*journal));
        view->prepareOpenGL();
        journal->take();
    }

    void select(const QString& name = "STUDIO (Cam 1)", const QString& url = "fake://one") {
        model->setQIVOSourceInfoNamed(name, url);
    }

    /// Connects, takes a first frame, and forgets what that did.
    void showFirstFrame(std::int32_t width = 64, std::int32_t height = 36, float aspect = kWide) {
        select();
        fake.addVideo(width, height, kRed, aspect);
        ASSERT_TRUE(view->captureNewVideoSample());
        journal->take();
    }

    FakeQivo& fake = FakeQivo::instance();
    AppData* model = AppData::inst();
    std::unique_ptr<Journal> journal;
    std::unique_ptr<ViewUnderTest> view;

  private:
    inline static std::unique_ptr<QApplication> s_application;
};

} // namespace qivo::test

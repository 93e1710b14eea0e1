#include "tests/video/ViewFixture.h"

namespace qivo::test {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

class VideoReceiverTest : public ViewFixture {
  protected:
    void SetUp() override {
        ViewFixture::SetUp();
        prepare();
    }

    Lines creations() { return fake.callsOf("recv_create_v3"); }
};

TEST_F(VideoReceiverTest, WithNothingSelectedThereIsNoReceiver) {
    EXPECT_FALSE(view->createQIVOReceiver());
    EXPECT_FALSE(view->captureNewVideoSample());
    EXPECT_THAT(journal->take(), IsEmpty());
}

TEST_F(VideoReceiverTest, ASelectionOfNothingConnectsToNothing) {
    select("", "");
    EXPECT_FALSE(view->captureNewVideoSample());
    EXPECT_THAT(journal->take(), IsEmpty());
}

TEST_F(VideoReceiverTest, ConnectsToTheSelectedSource) {
    select("STUDIO (Käm 1)", "fake://ö");
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_THAT(creations(), ElementsAre("recv_create_v3(name=STUDIO (Käm 1), url=fake://ö, color=2, bandwidth=100, "
                                         "fields=0, receiver=null)"));
}

TEST_F(VideoReceiverTest, ASourceKnownOnlyByUrlConnectsWithANullName) {
    select(QString(), "fake://one");
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_THAT(creations(), ElementsAre(StartsWith("recv_create_v3(name=null, url=fake://one,")));
}

TEST_F(VideoReceiverTest, ASourceKnownOnlyByNameConnectsWithANullUrl) {
    select("STUDIO (Cam 1)", QString());
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_THAT(creations(), ElementsAre(StartsWith("recv_create_v3(name=STUDIO (Cam 1), url=null,")));
}

TEST_F(VideoReceiverTest, AnEmptyNameIsPassedAsAnEmptyText) {
    select("", "fake://one");
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_THAT(creations(), ElementsAre(StartsWith("recv_create_v3(name=, url=fake://one,")));
}

TEST_F(VideoReceiverTest, WithoutAChangeItConnectsOnce) {
    select();
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_EQ(creations().size(), 1U);
}

TEST_F(VideoReceiverTest, SelectingTheSameSourceAgainReconnects) {
    select();
    EXPECT_TRUE(view->createQIVOReceiver());
    select();
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_EQ(creations().size(), 2U);
    EXPECT_EQ(fake.openReceivers(), 1);
}

TEST_F(VideoReceiverTest, AFailedCreationIsNotTriedAgainUntilAChange) {
    fake.setReceiverCreates(false);
    select();
    EXPECT_FALSE(view->createQIVOReceiver());
    EXPECT_FALSE(view->createQIVOReceiver());
    EXPECT_FALSE(view->captureNewVideoSample());
    EXPECT_EQ(creations().size(), 1U);
    fake.setReceiverCreates(true);
    EXPECT_FALSE(view->createQIVOReceiver());
    select();
    EXPECT_TRUE(view->createQIVOReceiver());
}

TEST_F(VideoReceiverTest, TogglingLowBandwidthReconnectsAndTogglingItBackReconnectsAgain) {
    select();
    view->createQIVOReceiver();
    model->setIsLowBandwidth(true);
    view->createQIVOReceiver();
    model->setIsLowBandwidth(false);
    view->createQIVOReceiver();
    EXPECT_THAT(creations(), ElementsAre(HasSubstr("url=fake://one, color=2, bandwidth=100,"),
                                         HasSubstr("url=fake://one, color=2, bandwidth=0,"),
                                         HasSubstr("url=fake://one, color=2, bandwidth=100,")));
}

TEST_F(VideoReceiverTest, ReconnectingGivesTheFrameBackFirstAndPrintsNothing) {
    showFirstFrame();
    model->setDeviceWebpageURL("http://page");
    select("OTHER (Cam)", "fake://two");
    testing::internal::CaptureStdout();
    EXPECT_TRUE(view->createQIVOReceiver());
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_THAT(journal->take(), ElementsAre(StartsWith("recv_free_video_v2(r1"), StartsWith("recv_destroy(r1"),
                                             StartsWith("recv_create_v3(name=OTHER (Cam)")));
    EXPECT_EQ(model->deviceWebpageURL(), "");
    EXPECT_FALSE(model->deviceWebpageURL().isNull());
}

TEST_F(VideoReceiverTest, ReconnectingForBandwidthLeavesThePtzSourceAsItIs) {
    select();
    fake.setWebControl("http://page");
    fake.setPtzSupported(true);
    fake.addStatusChange();
    view->captureNewVideoSample();
    const auto source = model->ptzSource();
    ASSERT_NE(source, nullptr);
    model->setIsLowBandwidth(true);
    view->createQIVOReceiver();
    EXPECT_EQ(model->ptzSource(), source);
}

TEST_F(VideoReceiverTest, DeselectingEndsTheReceiver) {
    select();
    EXPECT_TRUE(view->createQIVOReceiver());
    select(QString(), QString());
    EXPECT_FALSE(view->createQIVOReceiver());
    EXPECT_EQ(fake.openReceivers(), 0);
}

TEST_F(VideoReceiverTest, CapturesVideoOnlyAndNeverWaits) {
    select();
    EXPECT_FALSE(view->captureNewVideoSample());
    EXPECT_THAT(fake.callsOf("recv_capture_v2"), ElementsAre(StartsWith("recv_capture_v2(r1, video, timeout=0)")));
}

TEST_F(VideoReceiverTest, TheFirstFrameMakesATextureOfItsGeometry) {
    select();
    fake.addVideo(64, 36, kRed, kWide, 300);
    EXPECT_TRUE(view->captureNewVideoSample());
    const Lines lines = journal->take();
    const auto lock = std::find(lines.begin(), lines.end(), "lock");
    ASSERT_NE(lock, lines.end());
    EXPECT_EQ(*(lock - 1), "makeCurrentContext");
    EXPECT_EQ(*(lock + 1), call("glGenTextures", 1));
    EXPECT_EQ(lines.back(), "unlock");
    EXPECT_THAT(lines, Contains(call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 75)));
    ASSERT_EQ(fake.framesOutData().size(), 1U);
    EXPECT_THAT(lines, Contains(call("glTexImage2D", GL_TEXTURE_2D, 0, GL_RGBA8, 64, 36, 0, GL_RGBA,
                                     GL_UNSIGNED_INT_8_8_8_8_REV, fake.framesOutData()[0])));
}

TEST_F(VideoReceiverTest, AFrameOfTheSameGeometryIsUploadedIntoTheTexture) {
    showFirstFrame();
    fake.addVideo(64, 36, kRed, kWide);
    EXPECT_TRUE(view->captureNewVideoSample());
    ASSERT_EQ(fake.framesOutData().size(), 1U);
    EXPECT_THAT(journal->take(), ElementsAre(StartsWith("recv_capture_v2"), "makeCurrentContext", "lock",
                                             call("glEnable", GL_TEXTURE_2D), StartsWith("glBindTexture(0xDE1, "),
                                             call("glTexSubImage2D", GL_TEXTURE_2D, 0, 0, 0, 64, 36, GL_RGBA,
                                                  GL_UNSIGNED_INT_8_8_8_8_REV, fake.framesOutData()[0]),
                                             call("glBindTexture", GL_TEXTURE_2D, 0), call("glDisable", GL_TEXTURE_2D),
                                             "unlock", StartsWith("recv_free_video_v2(r1")));
}

TEST_F(VideoReceiverTest, AnotherRowStrideAloneRebuildsTheTexture) {
    showFirstFrame();
    fake.addVideo(64, 36, kRed, kWide, 512);
    EXPECT_TRUE(view->captureNewVideoSample());
    const Lines lines = journal->take();
    EXPECT_THAT(lines, Contains(call("glPixelStorei", GL_UNPACK_ROW_LENGTH, 128)));
    EXPECT_THAT(lines, Contains(StartsWith("glTexImage2D")));
    EXPECT_THAT(lines, Not(Contains(StartsWith("glTexSubImage2D"))));
}

TEST_F(VideoReceiverTest, AnotherSizeReleasesTheOldTextureBeforeTheNewOneIsMade) {
    showFirstFrame();
    fake.addVideo(32, 18, kRed, kWide);
    EXPECT_TRUE(view->captureNewVideoSample());
    const Lines lines = journal->take();
    const auto index = [&](const std::string& prefix) {
        return std::find_if(lines.begin(), lines.end(), [&](const auto& line) { return line.starts_with(prefix); }) -
               lines.begin();
    };
    EXPECT_LT(index("lock"), index("glDeleteTextures"));
    EXPECT_LT(index("glDeleteTextures"), index("glGenTextures"));
    EXPECT_LT(index("glTexImage2D"), index("unlock"));
    EXPECT_LT(index("unlock"), index("recv_free_video_v2"));
}

TEST_F(VideoReceiverTest, AnotherAspectAloneKeepsTheTexture) {
    showFirstFrame();
    fake.addVideo(64, 36, kRed, 4.0F / 3.0F);
    EXPECT_TRUE(view->captureNewVideoSample());
    EXPECT_THAT(journal->take(), Contains(StartsWith("glTexSubImage2D")));
}

TEST_F(VideoReceiverTest, OneFrameIsHeldAndNoneIsCopied) {
    showFirstFrame();
    for (int i = 0; i < 5; ++i) {
        EXPECT_EQ(fake.framesOut(), 1);
        fake.addVideo(64, 36, kRed, kWide);
        view->captureNewVideoSample();
    }
    EXPECT_EQ(fake.framesOut(), 1);
}

TEST_F(VideoReceiverTest, OnlyOneFrameIsTakenInAPass) {
    select();
    fake.addVideo(64, 36, kRed, kWide);
    fake.addVideo(64, 36, kRed, kWide);
    EXPECT_TRUE(view->captureNewVideoSample());
    EXPECT_EQ(fake.callsOf("recv_capture_v2").size(), 1U);
}

TEST_F(VideoReceiverTest, WithoutANewFrameTheLastOneStays) {
    showFirstFrame();
    for (const int type : std::initializer_list<int>{QIVOlib_frame_type_none, QIVOlib_frame_type_error,
                                                     QIVOlib_frame_type_audio, QIVOlib_frame_type_metadata, 77, -1}) {
        FakeQivo::Capture capture;
        capture.type = type;
        fake.addCapture(capture);
        EXPECT_FALSE(view->captureNewVideoSample()) << type;
    }
    EXPECT_EQ(fake.framesOut(), 1);
    EXPECT_THAT(journal->take(), testing::Each(StartsWith("recv_capture_v2")));
}

TEST_F(VideoReceiverTest, SeveralStatusChangesAreConsumedInOnePass) {
    select();
    fake.setWebControl("http://page");
    fake.addStatusChange();
    fake.addStatusChange();
    fake.addStatusChange();
    fake.addVideo(64, 36, kRed, kWide);
    EXPECT_TRUE(view->captureNewVideoSample());
    EXPECT_EQ(fake.callsOf("recv_capture_v2").size(), 4U);
    fake.addStatusChange();
    EXPECT_FALSE(view->captureNewVideoSample());
}

TEST_F(VideoReceiverTest, AStatusChangeWithAPagePublishesItAndAsksForPtz) {
    select();
    fake.setWebControl("http://käm");
    fake.addStatusChange();
    view->captureNewVideoSample();
    EXPECT_EQ(model->deviceWebpageURL(), QStringLiteral("http://käm"));
    EXPECT_EQ(model->ptzSource(), nullptr);
    EXPECT_THAT(journal->take(), ElementsAre(StartsWith("recv_create_v3"), StartsWith("recv_capture_v2"),
                                             StartsWith("recv_get_web_control(r1"), StartsWith("recv_free_string(r1"),
                                             StartsWith("recv_ptz_is_supported(r1"), StartsWith("recv_capture_v2")));
}

TEST_F(VideoReceiverTest, ACameraWithAPageIsPublishedAsPtzSource) {
    select();
    fake.setWebControl("http://page");
    fake.setPtzSupported(true);
    fake.addStatusChange();
    view->captureNewVideoSample();
    EXPECT_TRUE(model->hasPTZControl());
}

TEST_F(VideoReceiverTest, AStatusChangeWithoutAPageOnlyCapturesAgain) {
    select();
    fake.setPtzSupported(true);
    fake.addStatusChange();
    view->captureNewVideoSample();
    EXPECT_THAT(fake.callsOf("recv_ptz_is_supported"), IsEmpty());
    EXPECT_EQ(fake.callsOf("recv_capture_v2").size(), 2U);
    EXPECT_TRUE(model->deviceWebpageURL().isNull());
    EXPECT_FALSE(model->hasPTZControl());
}

TEST_F(VideoReceiverTest, ALostPtzSupportIsNotCleared) {
    select();
    fake.setWebControl("http://page");
    fake.setPtzSupported(true);
    fake.addStatusChange();
    view->captureNewVideoSample();
    fake.setPtzSupported(false);
    fake.addStatusChange();
    view->captureNewVideoSample();
    EXPECT_TRUE(model->hasPTZControl());
}

TEST_F(VideoReceiverTest, APageThatIsNotUtf8CountsAsMissing) {
    select();
    fake.setWebControl("http://\xff\xfe");
    fake.addStatusChange();
    model->setDeviceWebpageURL("http://before");
    view->captureNewVideoSample();
    EXPECT_TRUE(model->deviceWebpageURL().isNull());
}

TEST_F(VideoReceiverTest, ClosingGivesBackPrintsAndClears) {
    showFirstFrame();
    model->setDeviceWebpageURL("http://page");
    fake.setWebControl("http://page");
    fake.setPtzSupported(true);
    fake.addStatusChange();
    view->captureNewVideoSample();
    journal->take();
    testing::internal::CaptureStdout();
    view->closeQIVOReceiver();
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "Destroying the QIVO receiver \nThe QIVO receiver has been destroyed \n");
    EXPECT_THAT(journal->take(), ElementsAre(StartsWith("recv_free_video_v2(r1"), StartsWith("recv_destroy(r1")));
    EXPECT_FALSE(model->hasPTZControl());
    EXPECT_EQ(model->deviceWebpageURL(), "");
    EXPECT_FALSE(model->deviceWebpageURL().isNull());
}

TEST_F(VideoReceiverTest, ClosingWithoutAReceiverOnlyClearsThePtzSource) {
    model->setPtzSource(reinterpret_cast<QIVOlib_recv_instance_t>(view.get()));
    model->setDeviceWebpageURL("http://page");
    testing::internal::CaptureStdout();
    view->closeQIVOReceiver();
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_FALSE(model->hasPTZControl());
    EXPECT_EQ(model->deviceWebpageURL(), "http://page");
    EXPECT_THAT(journal->take(), IsEmpty());
}

TEST_F(VideoReceiverTest, AfterClosingNothingReconnectsUntilAChange) {
    showFirstFrame();
    view->closeQIVOReceiver();
    EXPECT_FALSE(view->captureNewVideoSample());
    EXPECT_EQ(creations().size(), 1U);
    model->setIsLowBandwidth(true);
    view->captureNewVideoSample();
    EXPECT_EQ(creations().size(), 2U);
    view->closeQIVOReceiver();
    view->captureNewVideoSample();
    EXPECT_EQ(creations().size(), 2U);
    select();
    view->captureNewVideoSample();
    EXPECT_EQ(creations().size(), 3U);
}

TEST_F(VideoReceiverTest, AfterReconnectingTheTextureServesAFrameOfTheSameGeometry) {
    showFirstFrame();
    select();
    fake.addVideo(64, 36, kRed, kWide);
    EXPECT_TRUE(view->captureNewVideoSample());
    EXPECT_THAT(journal->take(), Contains(StartsWith("glTexSubImage2D")));
}

TEST_F(VideoReceiverTest, AFrameWithoutPixelsIsNotGivenBack) {
    select();
    FakeQivo::Capture capture;
    capture.type = QIVOlib_frame_type_video;
    fake.addCapture(capture);
    EXPECT_TRUE(view->captureNewVideoSample());
    fake.addVideo(64, 36, kRed, kWide);
    EXPECT_TRUE(view->captureNewVideoSample());
    EXPECT_THAT(fake.callsOf("recv_free_video_v2"), IsEmpty());
    view.reset();
    fake.reset(); // it counts the frame without pixels as out
}

} // namespace
} // namespace qivo::test

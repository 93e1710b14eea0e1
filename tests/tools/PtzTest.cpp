#include "tests/tools/Browser.h"
#include "tests/tools/HttpClient.h"
#include "tests/tools/OnvifToken.h"
#include "tests/tools/Prober.h"
#include "tests/tools/Publisher.h"
#include "tests/tools/Watcher.h"
#include "tools/publish/CameraPicture.h"
#include "tools/publish/HttpServer.h"
#include "tools/publish/PositionCode.h"
#include "tools/publish/onvif/Duration.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <cstring>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;

const std::string ptzStart = "<s:Envelope xmlns:s=\"http://www.w3.org/2003/05/soap-envelope\" "
                             "xmlns:p=\"http://www.onvif.org/ver20/ptz/wsdl\" "
                             "xmlns:t=\"http://www.onvif.org/ver10/schema\">";

std::string ptzCall(const std::string& name, const std::string& content, const std::string& header = {}) {
    return ptzStart + "<s:Header>" + header + "</s:Header><s:Body><p:" + name +
           "><p:ProfileToken>full</p:ProfileToken>" + content + "</p:" + name + "></s:Body></s:Envelope>";
}

std::string velocity(const std::string& pan, const std::string& timeout) {
    return "<p:Velocity><t:PanTilt x=\"" + pan + "\" y=\"0\"/></p:Velocity><p:Timeout>" + timeout + "</p:Timeout>";
}

const std::string probe = "<e:Envelope xmlns:e=\"http://www.w3.org/2003/05/soap-envelope\"><e:Body><Probe "
                          "xmlns=\"http://schemas.xmlsoap.org/ws/2005/04/discovery\"/></e:Body></e:Envelope>";

/// The publisher of cameras: each prints four addresses.
struct Cameras {
    explicit Cameras(std::vector<std::string> arguments, std::size_t count = 1)
        : publisher(
              (arguments.insert(arguments.begin(), {"--machine", "STUDIO", "--http-port", "0", "--ptz"}), arguments),
              4 * count) {}

    [[nodiscard]] std::string onvif(std::size_t camera = 0) const { return publisher.address(4 * camera + 3); }
    [[nodiscard]] std::string full(std::size_t camera = 0) const { return publisher.address(4 * camera); }
    [[nodiscard]] std::string low(std::size_t camera = 0) const { return publisher.address(4 * camera + 1); }

    /// Posts to a camera's PTZ service, and returns the whole answer.
    [[nodiscard]] std::string post(const std::string& body, const std::string& headers = {},
                                   std::size_t camera = 0) const {
        const std::string address = onvif(camera);
        const std::size_t host = std::strlen("http://");
        const std::size_t path = address.find('/', host);
        const std::string authority = address.substr(host, path - host);
        const int port = std::stoi(authority.substr(authority.find(':') + 1));
        return ask(port, "POST " + address.substr(path, address.rfind('/') + 1 - path) +
                             "ptz HTTP/1.1\r\nHost: " + authority + "\r\n" + headers +
                             "Content-Type: application/soap+xml\r\nContent-Length: " + std::to_string(body.size()) +
                             "\r\n\r\n" + body);
    }

    PublishProcess publisher;
};

std::optional<PositionCode> positionIn(const std::optional<Frame>& frame) {
    return frame ? readPositionCode(frame->pixels.data(), frame->width, frame->height, 4L * frame->width)
                 : std::nullopt;
}

/// The part of a frame that shows the scene.
std::vector<std::uint8_t> sceneOf(const Frame& frame) {
    const int rows = CameraPicture::sceneSize({frame.width, frame.height}).height;
    return {frame.pixels.begin(), frame.pixels.begin() + 4L * frame.width * rows};
}

double meanDifference(const std::vector<std::uint8_t>& one, const std::vector<std::uint8_t>& other) {
    double sum = 0;
    for (std::size_t i = 0; i < one.size(); ++i) {
        sum += std::abs(one[i] - other[i]);
    }
    return sum / static_cast<double>(one.size());
}

/// Frames until one shows the camera where `there` wants it.
template <typename There>
std::optional<Frame> waitFor(Watcher& watcher, There there) {
    const auto deadline = std::chrono::steady_clock::now() + 15s;
    while (std::chrono::steady_clock::now() < deadline) {
        auto frame = watcher.next();
        const auto position = positionIn(frame);
        if (position && there(*position)) {
            return frame;
        }
    }
    return std::nullopt;
}

TEST(Ptz, aCameraIsAnnouncedWithItsServicesAndItsPage) {
    const Cameras cameras({"--source", "Cam", "--source", "Other", "--web", "http://own.local/"}, 2);
    const Browser browser;
    ASSERT_TRUE(browser.waitFor("STUDIO (Cam)"));
    ASSERT_TRUE(browser.waitFor("STUDIO (Other)"));
    auto found = browser.found();
    EXPECT_EQ(found["STUDIO (Cam)"].text["onvif"], cameras.onvif());
    EXPECT_EQ(found["STUDIO (Cam)"].text["web"], cameras.publisher.address(2));
    EXPECT_EQ(found["STUDIO (Other)"].text["onvif"], cameras.onvif(1));
    EXPECT_EQ(found["STUDIO (Other)"].text["web"], "http://own.local/");
    EXPECT_THAT(cameras.onvif(), testing::StartsWith("http://127.0.0.1:"));
}

TEST(Ptz, whatIsNoCameraIsNotSteered) {
    const PublishProcess publisher({"--machine", "STUDIO", "--source", "Cam"});
    const Browser browser;
    ASSERT_TRUE(browser.waitFor("STUDIO (Cam)"));
    EXPECT_EQ(browser.found()["STUDIO (Cam)"].text.count("onvif"), 0U);
    const Prober prober;
    prober.probe(probe);
    EXPECT_FALSE(prober.next(300ms));
}

TEST(Ptz, aProbeFindsEveryCameraWhereItIsServed) {
    const Cameras cameras({"--source", "A", "--source", "B"}, 2);
    const Prober prober;
    prober.probe("not a probe");
    prober.probe(probe);
    std::string answers;
    for (int i = 0; i < 2; ++i) {
        answers += prober.next(10s).value_or("");
    }
    EXPECT_THAT(answers, HasSubstr("<d:XAddrs>" + cameras.onvif(0) + "</d:XAddrs>"));
    EXPECT_THAT(answers, HasSubstr("<d:XAddrs>" + cameras.onvif(1) + "</d:XAddrs>"));
    EXPECT_FALSE(prober.next(100ms)) << "an answer too many";
}

TEST(Ptz, aProbeToThisMachineAloneIsNotAnswered) {
    const Cameras cameras({});
    const Prober prober;
    prober.probeDirectly(probe);
    prober.probe(probe);
    EXPECT_TRUE(prober.next(10s));
    EXPECT_FALSE(prober.next(200ms));
}

TEST(Ptz, camerasSayWhenTheyComeAndGo) {
    const Prober listener(true);
    Cameras cameras({});
    const auto hello = listener.next(10s);
    ASSERT_TRUE(hello);
    EXPECT_THAT(*hello, HasSubstr("<d:Hello>"));
    EXPECT_THAT(*hello, HasSubstr(cameras.onvif()));
    cameras.publisher.process().signal(SIGTERM);
    EXPECT_EQ(cameras.publisher.process().wait(5s), 0);
    EXPECT_THAT(listener.next(10s).value_or(""), HasSubstr("<d:Bye>"));
}

TEST(Ptz, bothStreamsShowTheCameraMoveAndStandAtTheTimeout) {
    const Cameras cameras({"--rate", "15", "--size", "640x360", "--no-audio"});
    Watcher full(cameras.full(), "tcp");
    Watcher low(cameras.low(), "tcp");
    const auto before = waitFor(full, [](const PositionCode& at) { return at.pan == 0; });
    ASSERT_TRUE(before);
    EXPECT_TRUE(waitFor(low, [](const PositionCode& at) { return at.pan == 0; }));
    EXPECT_EQ(statusOf(cameras.post(ptzCall("ContinuousMove", velocity("0.5", "PT0.8S")))), 200);
    constexpr double end = 0.5 * 0.8 * Camera::turnRate;
    const auto there = [](const PositionCode& at) { return std::abs(at.pan - end) < 0.001; };
    EXPECT_TRUE(waitFor(full, [](const PositionCode& at) { return at.pan > 0.01 && at.pan < end - 0.01; })) << "glides";
    const auto after = waitFor(full, there);
    ASSERT_TRUE(after);
    EXPECT_TRUE(waitFor(low, there));
    const auto later = full.next();
    ASSERT_TRUE(later);
    EXPECT_TRUE(there(positionIn(later).value_or(PositionCode())));
    const double moved = meanDifference(sceneOf(*before), sceneOf(*after));
    EXPECT_GT(moved, 5);
    EXPECT_LT(meanDifference(sceneOf(*after), sceneOf(*later)), moved / 5);
    EXPECT_TRUE(later->latency()) << "the time code";
}

TEST(Ptz, everyCameraIsOneOfItsOwn) {
    const Cameras cameras({"--source", "A", "--source", "B"}, 2);
    EXPECT_EQ(statusOf(cameras.post(ptzCall("ContinuousMove", velocity("1", "PT10S")), {}, 1)), 200);
    EXPECT_EQ(statusOf(cameras.post(ptzCall("SetPreset", "<p:PresetName>Mine</p:PresetName>"), {}, 1)), 200);
    EXPECT_THAT(cameras.post(ptzCall("GetStatus", {}), {}, 1), HasSubstr(">MOVING<"));
    EXPECT_THAT(cameras.post(ptzCall("GetStatus", {}), {}, 0), testing::Not(HasSubstr(">MOVING<")));
    EXPECT_THAT(cameras.post(ptzCall("GetPresets", {}), {}, 0), testing::Not(HasSubstr("Mine")));
    EXPECT_THAT(cameras.post(ptzCall("GetPresets", {}), {}, 1), HasSubstr("Mine"));
}

TEST(Ptz, aLoginIsAskedForAndTakenByWsSecurity) {
    const Cameras cameras({"--login", "admin:secret"});
    const std::string refused = cameras.post(ptzCall("GetStatus", {}));
    EXPECT_EQ(statusOf(refused), 401);
    EXPECT_THAT(refused, HasSubstr("WWW-Authenticate: Digest "));
    EXPECT_THAT(refused, HasSubstr("ter:NotAuthorized"));
    Token token;
    token.created = utcText(std::chrono::system_clock::now());
    EXPECT_EQ(statusOf(cameras.post(ptzCall("Stop", {}, token.xml()))), 200);
    EXPECT_EQ(statusOf(cameras.post(ptzCall("Stop", {}, token.xml()))), 400) << "heard before";
}

TEST(Ptz, hostileRequestsAreRefusedAndTheNextIsAnswered) {
    const Cameras cameras({});
    const std::string good = ptzCall("GetStatus", {});
    EXPECT_EQ(statusOf(cameras.post("<!DOCTYPE x [<!ENTITY a \"b\">]>" + good)), 400);
    EXPECT_EQ(statusOf(cameras.post("nothing")), 400);
    EXPECT_EQ(statusOf(cameras.post(good + std::string(maximumHttpRequestBytes, ' '))), 413);
    EXPECT_EQ(statusOf(cameras.post(ptzCall("ContinuousMove", velocity("NaN", "PT1S")))), 400);
    EXPECT_EQ(statusOf(cameras.post(good, "Origin: http://elsewhere.example\r\n")), 403);
    EXPECT_EQ(statusOf(cameras.post(good)), 200);
}

} // namespace
} // namespace qivo::test

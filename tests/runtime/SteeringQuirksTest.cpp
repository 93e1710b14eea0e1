// Cameras as they are: each of the table is steered, or refused, without harm.

#include "tests/runtime/SteeringFixture.h"

#include <glib.h>
#include <gtest/gtest.h>

#include <memory>
#include <mutex>
#include <regex>
#include <set>
#include <string>

namespace qivo::test {
namespace {

using Camera = ScriptedCamera;

struct Quirk {
    std::string name;
    bool steered = true; ///< or else refused
    Camera::Quirk quirk{};
    std::function<void(Camera&)> prepare{};
    std::string login{};
    /// What must hold in the end.
    std::function<void(Camera&)> check{};
};

std::ostream& operator<<(std::ostream& out, const Quirk& quirk) {
    return out << quirk.name;
}

/// Answers one operation with a document.
Camera::Quirk answering(const std::string& operation, const std::string& xml, const std::string& status = "200 OK") {
    return [=](Camera&, Connection& connection, const CameraCall& call) {
        return call.operation == operation && connection.send(Camera::http(xml, status));
    };
}

std::string md5(const std::string& text) {
    gchar* sum = g_compute_checksum_for_string(G_CHECKSUM_MD5, text.c_str(), static_cast<gssize>(text.size()));
    std::string result = sum;
    g_free(sum);
    return result;
}

/// Whether the request proves the login ann:secret by HTTP's digest.
bool provesDigest(const CameraCall& call) {
    const std::size_t at = call.header.find("Authorization: Digest ");
    if (at == std::string::npos) {
        return false;
    }
    const std::string header = call.header.substr(at, call.header.find("\r\n", at) - at);
    const std::string secret = md5("ann:camera:secret");
    const std::string request = md5("POST:" + call.path);
    const std::string expected = md5(secret + ":" + parameterOf(header, "nonce") + ":" + parameterOf(header, "nc") +
                                     ":" + parameterOf(header, "cnonce") + ":auth:" + request);
    return parameterOf(header, "username") == "ann" && parameterOf(header, "response") == expected;
}

bool digestOnly(Camera&, Connection& connection, const CameraCall& call) {
    if (call.operation == "GetSystemDateAndTime" || provesDigest(call)) {
        return false;
    }
    return connection.send(Camera::http("", "401 Unauthorized",
                                        "WWW-Authenticate: Digest realm=\"camera\", nonce=\"abc\", qop=\"auth\"\r\n"));
}

bool aDayAhead(Camera& camera, Connection& connection, const CameraCall& call) {
    return call.operation != "GetSystemDateAndTime" && !provesToken(call, camera) &&
           connection.send(Camera::http(Camera::fault("not authorized"), "400 Bad Request"));
}

bool basicOnly(Camera&, Connection& connection, const CameraCall&) {
    return connection.send(Camera::http("", "401 Unauthorized", "WWW-Authenticate: Basic realm=\"camera\"\r\n"));
}

bool redirecting(Camera& camera, Connection& connection, const CameraCall& call) {
    return call.path.find("/moved") != 0 &&
           connection.send(Camera::http("", "307 Temporary Redirect", "Location: " + camera.url("/moved") + "\r\n"));
}

bool redirectingAway(Camera& camera, Connection& connection, const CameraCall&) {
    return connection.send(
        Camera::http("", "302 Found", "Location: http://localhost:" + std::to_string(camera.port()) + "/away\r\n"));
}

bool redirectingInCircles(Camera&, Connection& connection, const CameraCall&) {
    return connection.send(Camera::http("", "308 Permanent Redirect", "Location: /onvif/device_service\r\n"));
}

bool slow(Camera& camera, Connection& connection, const CameraCall& call) {
    std::this_thread::sleep_for(150ms);
    return connection.send(Camera::http(camera.answerTo(call)));
}

/// As long as it is read, and a little more than that.
bool huge(Camera&, Connection& connection, const CameraCall&) {
    connection.send("HTTP/1.1 200 OK\r\nContent-Type: application/soap+xml\r\n\r\n<Envelope><Body>");
    const std::string piece(1U << 16U, ' ');
    for (int i = 0; i < 4096 && connection.send(piece); ++i) {
    }
    connection.close();
    return true;
}

bool dead(Camera&, Connection& connection, const CameraCall&) {
    connection.untilClosed();
    return true;
}

/// Takes 50 ms for every byte, for ever, and comes to no end of the header.
bool drip(Camera&, Connection& connection, const CameraCall&) {
    while (connection.send("H")) {
        std::this_thread::sleep_for(50ms);
    }
    return true;
}

bool hangsUp(Camera&, Connection& connection, const CameraCall& call) {
    if (call.operation == "GetProfiles") {
        connection.send("HTTP/1.1 200 OK\r\nContent-Length: 5000\r\n\r\n<Envelope>");
    }
    connection.close();
    return true;
}

/// Answers as servers of HTTP 1.0 do, whose answers end with the connection.
bool closesAfterEach(Camera& camera, Connection& connection, const CameraCall& call) {
    connection.send("HTTP/1.0 200 OK\r\nConnection: close\r\n\r\n" + camera.answerTo(call));
    connection.close();
    return true;
}

/// Does what it is told and ends the connection in place of an answer, the first time for each command.
Camera::Quirk losingAnswers() {
    return [lost = std::make_shared<std::set<std::string>>(),
            mutex = std::make_shared<std::mutex>()](Camera& camera, Connection& connection, const CameraCall& call) {
        if (call.operation.find("Get") == 0) {
            return false;
        }
        {
            const std::lock_guard guard(*mutex);
            if (!lost->insert(call.operation).second) {
                return false;
            }
        }
        camera.answerTo(call);
        connection.close();
        return true;
    };
}

std::string withoutPrefixes(std::string xml) {
    xml = std::regex_replace(xml, std::regex("(</?)[a-z]+:"), "$1");
    return std::regex_replace(xml, std::regex(" xmlns:[a-z]+=\"[^\"]*\""), "");
}

std::string oddPrefixes(std::string xml) {
    xml = std::regex_replace(xml, std::regex("tptz:"), "ns17:");
    xml = std::regex_replace(xml, std::regex("xmlns:tptz"), "xmlns:ns17");
    xml = std::regex_replace(xml, std::regex("env"), "SOAP-ENV");
    xml = std::regex_replace(xml, std::regex("http://www.onvif.org/ver10/schema"), "urn:schema");
    return std::regex_replace(xml, std::regex("http://www.w3.org/2003/05/soap-SOAP-ENVelope"),
                              "http://schemas.xmlsoap.org/soap/envelope/");
}

bool onlyServices(Camera& camera, Connection& connection, const CameraCall& call) {
    if (call.operation == "GetCapabilities") {
        return connection.send(Camera::http(Camera::fault("no such operation"), "500 Internal Server Error"));
    }
    const auto service = [&](const std::string& space, const std::string& path) {
        return "<tds:Service><tds:Namespace>http://www.onvif.org/" + space + "</tds:Namespace><tds:XAddr>" +
               camera.url(path) + "</tds:XAddr></tds:Service>";
    };
    return call.operation == "GetServices" && connection.send(Camera::http(Camera::envelope(
                                                  "<tds:GetServicesResponse>" + service("ver10/media/wsdl", "/m") +
                                                  service("ver20/ptz/wsdl", "/p") + "</tds:GetServicesResponse>")));
}

std::string bomb() {
    std::string text = "<?xml version=\"1.0\"?><!DOCTYPE e [<!ENTITY a 'aaaaaaaaaa'>";
    for (char entity = 'b'; entity <= 'k'; ++entity) {
        const std::string inner(1, static_cast<char>(entity - 1));
        text += "<!ENTITY " + std::string(1, entity) + " '";
        for (int i = 0; i < 10; ++i) {
            text += "&" + inner + ";";
        }
        text += "'>";
    }
    return text + "]><Envelope><Body><R><Profiles token='&k;'>&k;</Profiles></R></Body></Envelope>";
}

void neverElsewhere(Camera& camera) {
    EXPECT_EQ(camera.count("GetProfiles") + camera.count("GetNodes") + camera.count("ContinuousMove"), 0);
    for (const CameraCall& call : camera.calls()) {
        EXPECT_NE(call.path, "/away");
    }
}

void neverInPlainText(Camera& camera) {
    for (const CameraCall& call : camera.calls()) {
        EXPECT_EQ(call.header.find("Authorization: Basic"), std::string::npos);
        EXPECT_EQ((call.header + call.body).find("secret"), std::string::npos);
    }
}

std::vector<Quirk> quirks() {
    return {
        {.name = "WellBehaved"},
        {.name = "NoStop", .quirk = answering("Stop", Camera::fault("action not supported"), "500 Error")},
        {.name = "NoStopAndTimeoutIgnored",
         .quirk = answering("Stop", Camera::fault("action not supported"), "500 Error"),
         .prepare = [](Camera& camera) { camera.ignoresRunOut = true; }},
        {.name = "TimeoutIgnored", .prepare = [](Camera& camera) { camera.ignoresRunOut = true; }},
        {.name = "NoPrefixes", .prepare = [](Camera& camera) { camera.rewrite = withoutPrefixes; }},
        {.name = "OddPrefixesAndNamespaces", .prepare = [](Camera& camera) { camera.rewrite = oddPrefixes; }},
        {.name = "PresetsWithoutNames", .prepare = [](Camera& camera) { camera.namesPresets = false; }},
        {.name = "PresetsNotListed", .quirk = answering("GetPresets", Camera::fault("no"), "500 Error")},
        {.name = "DigestOnly", .quirk = digestOnly, .login = "ann:secret", .check = neverInPlainText},
        {.name = "DigestAndNoLogin", .steered = false, .quirk = digestOnly},
        {.name = "DigestAndWrongLogin", .steered = false, .quirk = digestOnly, .login = "ann:wrong"},
        {.name = "ClockOneDayAhead",
         .quirk = aDayAhead,
         .prepare = [](Camera& camera) { camera.clockAhead = std::chrono::hours(24); },
         .login = "ann:secret",
         .check = neverInPlainText},
        {.name = "ClockOneDayBehind",
         .quirk = aDayAhead,
         .prepare = [](Camera& camera) { camera.clockAhead = -std::chrono::hours(24); },
         .login = "ann:secret"},
        {.name = "BasicOnly", .steered = false, .quirk = basicOnly, .login = "ann:secret", .check = neverInPlainText},
        {.name = "Slow", .quirk = slow},
        {.name = "Chunked", .prepare = [](Camera& camera) { camera.chunked = true; }},
        {.name = "ClosesAfterEach", .quirk = closesAfterEach},
        {.name = "LosesAnswers", .quirk = losingAnswers()},
        {.name = "OnlyServices", .quirk = onlyServices},
        {.name = "Redirecting", .quirk = redirecting},
        {.name = "RedirectingAway", .steered = false, .quirk = redirectingAway, .check = neverElsewhere},
        {.name = "RedirectingInCircles",
         .steered = false,
         .quirk = redirectingInCircles,
         .check = [](Camera& camera) { EXPECT_LE(camera.calls().size(), 20U); }},
        {.name = "ServicesOnAnotherHost",
         .steered = false,
         .prepare = [](Camera& camera) { camera.servicesAt = "http://localhost:" + std::to_string(camera.port()); },
         .check = neverElsewhere},
        {.name = "FaultsOnly",
         .steered = false,
         .quirk =
             [](Camera&, Connection& connection, const CameraCall&) {
                 return connection.send(Camera::http(Camera::fault("out of order"), "500 Internal Server Error"));
             }},
        {.name = "NoPtzNode",
         .steered = false,
         .quirk = answering("GetNodes", Camera::envelope("<tptz:GetNodesResponse/>"))},
        {.name = "AnotherStream", .steered = false, .prepare = [](Camera& camera) { camera.streamPath = "/other"; }},
        {.name = "EntityBomb", .steered = false, .quirk = answering("GetProfiles", bomb())},
        {.name = "Malformed",
         .steered = false,
         .quirk = answering("GetProfiles", "<Envelope><Body><Profiles token='a'></Envelope>")},
        {.name = "NotXml",
         .steered = false,
         .quirk = answering("GetCapabilities", "<html>Welcome", "404 Not Found"),
         .prepare = [](Camera& camera) { camera.rewrite = [](const std::string&) { return "login:"; }; }},
        {.name = "Huge", .steered = false, .quirk = huge},
        {.name = "HangsUp", .steered = false, .quirk = hangsUp},
        {.name = "Dead", .steered = false, .quirk = dead},
        {.name = "Drip", .steered = false, .quirk = drip},
        {.name = "FaultingMoves",
         .quirk =
             [](Camera& camera, Connection& connection, const CameraCall& call) {
                 if (call.operation != "ContinuousMove") {
                     return false;
                 }
                 camera.answerTo(call); // it moves all the same
                 return connection.send(Camera::http(Camera::fault("busy"), "500 Internal Server Error"));
             }},
    };
}

class SteeringQuirks : public SteeringCameraTest, public testing::WithParamInterface<Quirk> {
  protected:
    /// Pans, stops, stores and recalls.
    void drive(Camera& camera, runtime::Steering& steering) {
        EXPECT_TRUE(steering.panTilt(0.5F, 0));
        ASSERT_TRUE(camera.until([&] { return camera.speed().pan == -0.5F; }));
        const Stopwatch called;
        EXPECT_TRUE(steering.panTilt(0, 0));
        ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
        EXPECT_LT(called.passed(), 1s);
        ASSERT_TRUE(camera.until([&] { return camera.count("Stop") >= 1; }));
        EXPECT_LT(called.until(camera.call("Stop").at), kStopOnWire);
        EXPECT_TRUE(steering.store(4));
        EXPECT_TRUE(steering.recall(4, 0.25F));
        EXPECT_TRUE(camera.until([&] { return camera.lastRecalled() == "slotA"; }));
    }

    /// Begins to move and ends.
    void leave(Camera& camera, runtime::Steering& steering) {
        EXPECT_TRUE(steering.zoom(0.5F));
        ASSERT_TRUE(camera.until([&] { return camera.moves(); }));
        const Stopwatch called;
        steering.end();
        EXPECT_LT(called.passed(), 5ms * kSanitizerPatience);
        ASSERT_TRUE(camera.until([&] { return !camera.moves(); }));
        EXPECT_LT(called.passed(), 1s);
    }
};

TEST_P(SteeringQuirks, AreSteeredOrRefused) {
    const Quirk& quirk = GetParam();
    Camera camera(quirk.quirk, 0, quirk.prepare);
    const auto steering = steer(camera, quirk.login);
    if (quirk.steered) {
        ASSERT_TRUE(found(*steering));
        drive(camera, *steering);
        leave(camera, *steering);
    } else {
        camera.until([&] { return steering->isOver() || steering->isSupported(); }, 300ms);
        EXPECT_FALSE(steering->isSupported());
        EXPECT_FALSE(steering->panTilt(1, 0));
        EXPECT_FALSE(steering->panTilt(0, 0));
        EXPECT_EQ(m_changes, 0);
        steering->end();
    }
    EXPECT_TRUE(camera.until([&] { return steering->isOver(); }, 2s * kSanitizerPatience)) << "the thread hangs";
    if (quirk.check) {
        quirk.check(camera);
    }
}

INSTANTIATE_TEST_SUITE_P(Camera, SteeringQuirks, testing::ValuesIn(quirks()),
                         [](const auto& one) { return one.param.name; });

} // namespace
} // namespace qivo::test

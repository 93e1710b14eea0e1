#include "tests/tools/OnvifFixture.h"
#include "tools/publish/onvif/Duration.h"

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;
using testing::Not;

constexpr double near = 1e-9;

std::string velocity(const std::string& x, const std::string& y, const std::string& zoom) {
    return "<Velocity><PanTilt x=\"" + x + "\" y=\"" + y +
           "\" xmlns=\"http://www.onvif.org/ver10/schema\"/><Zoom x=\"" + zoom +
           "\" xmlns=\"http://www.onvif.org/ver10/schema\"/></Velocity>";
}

class Onvif : public OnvifFixture {};

TEST_F(Onvif, profilesNameBothStreamsAndWhatSteersThem) {
    const std::string profiles = ask(call(mediaSpace, "GetProfiles"));
    for (const char* part : {"<trt:Profiles token=\"full\"", "<trt:Profiles token=\"low\"", "<tt:Width>1280</tt:Width>",
                             "<tt:Width>320</tt:Width>", "<tt:FrameRateLimit>15</tt:FrameRateLimit>",
                             "<tt:PTZConfiguration token=\"ptz\">", "<tt:SourceToken>video</tt:SourceToken>"}) {
        EXPECT_THAT(profiles, HasSubstr(part));
    }
    const std::string low = ask(call(mediaSpace, "GetProfile", "<ProfileToken>low</ProfileToken>"));
    EXPECT_THAT(low, HasSubstr("<trt:Profile token=\"low\""));
    EXPECT_THAT(low, Not(HasSubstr("1280</tt:Width><tt:Height>720</tt:Height></tt:Resolution>")));
}

TEST_F(Onvif, streamAddressesAreWhereTheClientReachedTheMachine) {
    const auto uri = [&](const char* profile) {
        return ask(call(mediaSpace, "GetStreamUri", std::string("<ProfileToken>") + profile + "</ProfileToken>"));
    };
    EXPECT_THAT(uri("full"), HasSubstr("<tt:Uri>rtsp://192.168.7.8:8554/source-1</tt:Uri>"));
    m_place = {"cam.local", 80};
    EXPECT_THAT(uri("low"), HasSubstr("<tt:Uri>rtsp://cam.local:8554/source-1/low</tt:Uri>"));
}

TEST_F(Onvif, servicesAreListedWhereTheClientReachedTheMachine) {
    for (const std::string& found :
         {ask(call(deviceSpace, "GetServices", "<IncludeCapability>true</IncludeCapability>")),
          ask(call(deviceSpace, "GetCapabilities"))}) {
        for (const char* service : {"device_service", "media", "ptz", "imaging"}) {
            EXPECT_THAT(found, HasSubstr(std::string("XAddr>http://192.168.7.8:8080/source-1/onvif/") + service + "<"));
        }
    }
    const std::string ptz = ask(call(deviceSpace, "GetCapabilities", "<Category>PTZ</Category>"));
    EXPECT_THAT(ptz, HasSubstr("/ptz<"));
    EXPECT_THAT(ptz, Not(HasSubstr("/media<")));
    expectFault(call(deviceSpace, "GetCapabilities", "<Category>Analytics</Category>"), "NoSuchService");
}

TEST_F(Onvif, theHostHeaderSaysWhereTheClientReachedTheMachine) {
    const auto place = [](const char* host) {
        const OnvifPlace found = placeOf(host, "10.0.0.1", 8080);
        return found.host + ":" + std::to_string(found.port);
    };
    EXPECT_EQ(place("cam.local:99"), "cam.local:99");
    EXPECT_EQ(place("cam.local"), "cam.local:8080");
    for (const char* wrong : {"", ":80", "a b", "a\"b:80", "cam:0", "cam:65536", "cam:x", "cam:", "<x>", "a:1:2"}) {
        EXPECT_EQ(place(wrong), "10.0.0.1:8080") << wrong;
    }
    EXPECT_EQ(place(std::string(256, 'a').c_str()), "10.0.0.1:8080");
}

TEST_F(Onvif, namesOfAnyKindStayWithinTheirElements) {
    EXPECT_THAT(ask(call(mediaSpace, "GetProfiles")), HasSubstr("Cam &amp; &lt;1&gt;"));
    EXPECT_THAT(ask(call(deviceSpace, "GetScopes")), HasSubstr("name/STUDIO%20%28Cam%20%26%20%3C1%3E%29"));
}

TEST_F(Onvif, everyOperationAnswersWithItsOwnResponseOrAFaultThatIsXml) {
    for (const OnvifService& service : onvifServices()) {
        for (std::size_t i = 0; i < service.count; ++i) {
            const std::string name(service.first[i].name);
            const OnvifAnswer found =
                answer(soap(call(std::string(service.space), name,
                                 "<ProfileToken>low</ProfileToken><VideoSourceToken>video</VideoSourceToken>"
                                 "<ConfigurationToken>ptz</ConfigurationToken><NodeToken>head</NodeToken>")));
            EXPECT_TRUE(XmlDocument::parse(found.body)) << found.body;
            const std::string response = "<" + std::string(service.prefix) + ":" + name + "Response>";
            EXPECT_THAT(found.body, HasSubstr(found.status == 200 ? response : "<env:Fault>"));
        }
    }
}

TEST_F(Onvif, prefixesAndNamespacesOfAnyKindAreUnderstood) {
    const OnvifAnswer found =
        answer("<?xml version=\"1.0\"?><!-- hello --><x:Envelope xmlns:x=\"http://www.w3.org/2003/05/soap-envelope\" "
               "xmlns:p=\"http://www.onvif.org/ver20/ptz/wsdl\" xmlns:q=\"http://www.onvif.org/ver10/schema\"><x:Body>"
               "<p:ContinuousMove><p:ProfileToken> full </p:ProfileToken><p:Velocity><q:PanTilt x=\"1\" y=\"0\"/>"
               "</p:Velocity><p:Timeout>PT1S</p:Timeout></p:ContinuousMove></x:Body></x:Envelope>");
    EXPECT_EQ(found.status, 200) << found.body;
    EXPECT_TRUE(m_camera->state().turning);
    EXPECT_FALSE(m_camera->state().zooming);
}

TEST_F(Onvif, aContinuousMoveMovesAndEndsByItself) {
    askPtz("ContinuousMove", velocity("0.5", "-0.5", "0.2") + "<Timeout>PT0.5S</Timeout>");
    m_now += 200ms;
    EXPECT_TRUE(m_camera->state().turning);
    EXPECT_THAT(askPtz("GetStatus", ""), HasSubstr("<tt:PanTilt>MOVING</tt:PanTilt>"));
    m_now += 1h;
    const CameraPosition position = m_camera->state().position;
    EXPECT_NEAR(position.direction.pan, 0.25 * Camera::turnRate, near);
    EXPECT_NEAR(position.direction.tilt, -0.25 * Camera::turnRate, near);
    EXPECT_NEAR(position.zoom, 0.1 * Camera::zoomRate, near);
    const std::string status = askPtz("GetStatus", "");
    EXPECT_THAT(status, HasSubstr("<tt:PanTilt>IDLE</tt:PanTilt><tt:Zoom>IDLE</tt:Zoom>"));
    EXPECT_THAT(status, HasSubstr("<tt:PanTilt x=\"0.125\" y=\"-0.125\""));
}

TEST_F(Onvif, aTimeoutThatIsNoneOrTooLongIsRefused) {
    for (const char* timeout : {"PT61S", "-PT1S", "5", "PTS", "PT", "P", "PT1", "P1Y", "P1M", "PT1S1S", "PTNaNS", "1e9",
                                "PT1e1S", "PT99999999999999999999S", ""}) {
        expectPtzFault("ContinuousMove", velocity("1", "0", "0") + "<Timeout>" + timeout + "</Timeout>",
                       "TimeoutNotSupported");
    }
    EXPECT_FALSE(m_camera->state().turning);
}

TEST_F(Onvif, speedsThatAreNoNumberOrOutOfRangeAreRefusedAndTheCameraGoesOn) {
    askPtz("ContinuousMove", velocity("0.1", "0", "0"));
    for (const char* wrong :
         {"NaN", "nan", "INF", "-INF", "1.01", "-1.01", "1e300", "", "fast", "0x1", "1,0", "0.5 0"}) {
        expectPtzFault("ContinuousMove", velocity(wrong, "0", "0"), "InvalidVelocity");
        expectPtzFault("ContinuousMove", velocity("0", wrong, "0"), "InvalidVelocity");
        expectPtzFault("ContinuousMove", velocity("0", "0", wrong), "InvalidVelocity");
    }
    expectPtzFault("ContinuousMove", "<Velocity><PanTilt/></Velocity>", "InvalidVelocity");
    m_now += 1s;
    EXPECT_NEAR(m_camera->state().position.direction.pan, 0.1 * Camera::turnRate, near);
}

TEST_F(Onvif, aStopStopsWhatItNamesAndWhatItDoesNotMention) {
    const auto moving = [&](const std::string& stop) {
        askPtz("ContinuousMove", velocity("0.1", "0", "0.1"));
        askPtz("Stop", stop);
        const CameraState state = m_camera->state();
        return std::pair(state.turning, state.zooming);
    };
    EXPECT_EQ(moving(""), std::pair(false, false));
    EXPECT_EQ(moving("<PanTilt>true</PanTilt><Zoom>true</Zoom>"), std::pair(false, false));
    EXPECT_EQ(moving("<PanTilt>true</PanTilt><Zoom>false</Zoom>"), std::pair(false, true));
    EXPECT_EQ(moving("<PanTilt>0</PanTilt><Zoom>1</Zoom>"), std::pair(true, false));
    EXPECT_EQ(moving("<PanTilt>true</PanTilt>"), std::pair(false, false));
}

TEST_F(Onvif, absoluteAndRelativeMovesGoThereAtTheirSpeed) {
    const std::string speed = "<Speed><PanTilt x=\"0.5\" y=\"1\"/><Zoom x=\"1\"/></Speed>";
    askPtz("AbsoluteMove", "<Position><PanTilt x=\"0.5\" y=\"0.5\"/><Zoom x=\"0.25\"/></Position>" + speed);
    m_now += 1s;
    EXPECT_NEAR(m_camera->state().position.direction.pan, 0.5 * Camera::turnRate, near);
    m_now += 1h;
    askPtz("RelativeMove", "<Translation><PanTilt x=\"-0.25\" y=\"0\"/></Translation>");
    m_now += 1h;
    EXPECT_EQ(m_camera->state().position, (CameraPosition{{0.25, 0.5}, 0.25}));
    askPtz("GotoHomePosition", "");
    m_now += 1h;
    EXPECT_EQ(m_camera->state().position, CameraPosition());
    expectPtzFault("SetHomePosition", "", "CannotOverwriteHome");
}

TEST_F(Onvif, positionsStepsSpeedsAndSpacesThatAreNotThereAreRefused) {
    expectPtzFault("AbsoluteMove", "<Position><PanTilt x=\"1.1\" y=\"0\"/></Position>", "InvalidPosition");
    expectPtzFault("AbsoluteMove", "<Position><Zoom x=\"-0.1\"/></Position>", "InvalidPosition");
    expectPtzFault("AbsoluteMove", "<Position><Zoom x=\"NaN\"/></Position>", "InvalidPosition");
    expectPtzFault("RelativeMove", "<Translation><PanTilt x=\"NaN\" y=\"0\"/></Translation>", "InvalidTranslation");
    expectPtzFault("AbsoluteMove", "<Position><Zoom x=\"1\"/></Position><Speed><Zoom x=\"2\"/></Speed>",
                   "InvalidSpeed");
    expectPtzFault("GotoPreset", "<PresetToken>1</PresetToken><Speed><Zoom x=\"NaN\"/></Speed>", "InvalidSpeed");
    expectPtzFault("ContinuousMove",
                   "<Velocity><PanTilt x=\"1\" y=\"0\" space=\"http://www.onvif.org/ver10/tptz/PanTiltSpaces/"
                   "SphericalPositionSpace\"/></Velocity>",
                   "SpaceNotSupported");
    askPtz("ContinuousMove", "<Velocity><PanTilt x=\"1\" y=\"0\" space=\"http://www.onvif.org/ver10/tptz/PanTiltSpaces/"
                             "VelocityGenericSpace\"/></Velocity>");
    EXPECT_TRUE(m_camera->state().turning);
}

TEST_F(Onvif, unknownProfilesAreRefusedByEveryOperationThatTakesOne) {
    for (const char* name : {"ContinuousMove", "AbsoluteMove", "RelativeMove", "Stop", "GetStatus", "GetPresets",
                             "SetPreset", "GotoPreset", "RemovePreset", "GotoHomePosition"}) {
        for (const char* token : {"<ProfileToken>other</ProfileToken>", "<ProfileToken/>", ""}) {
            expectFault(call(ptzSpace, name, std::string(token) + velocity("1", "1", "1")), "NoProfile");
        }
    }
    expectFault(call(mediaSpace, "GetProfile", "<ProfileToken>FULL</ProfileToken>"), "NoProfile");
    expectFault(call(mediaSpace, "GetStreamUri", "<ProfileToken>x</ProfileToken>"), "NoProfile");
    EXPECT_EQ(m_camera->serial(), 0U);
}

TEST_F(Onvif, otherUnknownTokensAreRefused) {
    expectFault(call(ptzSpace, "GetNode", "<NodeToken>x</NodeToken>"), "NoEntity");
    expectFault(call(ptzSpace, "GetConfiguration", "<PTZConfigurationToken>x</PTZConfigurationToken>"), "NoConfig");
    expectFault(call(ptzSpace, "GetConfigurationOptions", "<ConfigurationToken>x</ConfigurationToken>"), "NoConfig");
    expectFault(call(mediaSpace, "GetVideoEncoderConfiguration", "<ConfigurationToken>x</ConfigurationToken>"),
                "NoConfig");
    expectFault(call(mediaSpace, "GetVideoSourceConfiguration", "<ConfigurationToken>x</ConfigurationToken>"),
                "NoConfig");
    for (const char* name :
         {"GetImagingSettings", "SetImagingSettings", "GetOptions", "GetMoveOptions", "Move", "Stop", "GetStatus"}) {
        expectFault(call(imagingSpace, name, "<VideoSourceToken>x</VideoSourceToken>"), "NoSource");
    }
}

TEST_F(Onvif, presetsAreSetListedRecalledAndRemoved) {
    EXPECT_THAT(askPtz("GetPresets", ""), Not(HasSubstr("<tptz:Preset ")));
    askPtz("ContinuousMove", velocity("1", "0", "0"));
    m_now += 500ms;
    askPtz("Stop", "");
    EXPECT_THAT(askPtz("SetPreset", "<PresetName>Door</PresetName>"),
                HasSubstr("<tptz:PresetToken>1</tptz:PresetToken>"));
    EXPECT_THAT(askPtz("SetPreset", "<PresetName>3</PresetName>"), HasSubstr("<tptz:PresetToken>3</tptz:PresetToken>"));
    EXPECT_THAT(askPtz("SetPreset", "<PresetToken>3</PresetToken>"), HasSubstr(">3</tptz:PresetToken>"));
    const std::string presets = askPtz("GetPresets", "", "low");
    EXPECT_THAT(presets, HasSubstr("<tptz:Preset token=\"1\"><tt:Name>Door</tt:Name>"));
    EXPECT_THAT(presets, HasSubstr("<tptz:Preset token=\"3\"><tt:Name>3</tt:Name>"));
    askPtz("GotoHomePosition", "");
    m_now += 1h;
    askPtz("GotoPreset", "<PresetToken>1</PresetToken><Speed><PanTilt x=\"0.1\" y=\"0.1\"/></Speed>");
    m_now += 1s;
    EXPECT_NEAR(m_camera->state().position.direction.pan, 0.1 * Camera::turnRate, near);
    m_now += 1h;
    EXPECT_NEAR(m_camera->state().position.direction.pan, 0.5 * Camera::turnRate, near);
    askPtz("RemovePreset", "<PresetToken>1</PresetToken>");
    expectPtzFault("GotoPreset", "<PresetToken>1</PresetToken>", "NoToken");
}

TEST_F(Onvif, aPresetIsMadeUnderTheTokenThatAClientChooses) {
    EXPECT_THAT(askPtz("SetPreset", "<PresetToken>9</PresetToken>"), HasSubstr(">9</tptz:PresetToken>"));
    EXPECT_THAT(askPtz("GetPresets", ""), HasSubstr("<tptz:Preset token=\"9\"><tt:Name>Preset 9</tt:Name>"));
}

TEST_F(Onvif, presetsOutOfRangeUnknownTakenOrMisnamedAreRefused) {
    for (const char* name : {"GotoPreset", "RemovePreset"}) {
        expectPtzFault(name, "<PresetToken>1</PresetToken>", "NoToken");
    }
    for (const char* token : {"0", "65", "-1", "01", "x", "4294967297", "../../etc"}) {
        const std::string element = std::string("<PresetToken>") + token + "</PresetToken>";
        for (const char* name : {"SetPreset", "GotoPreset", "RemovePreset"}) {
            expectPtzFault(name, element, "NoToken");
        }
    }
    askPtz("SetPreset", "<PresetName>Door</PresetName>");
    expectPtzFault("SetPreset", "<PresetName>Door</PresetName>", "PresetExist");
    expectPtzFault("SetPreset", "<PresetName>" + std::string(65, 'x') + "</PresetName>", "InvalidPresetName");
    expectPtzFault("SetPreset", "<PresetName>a&#9;b</PresetName>", "InvalidPresetName");
    for (int i = 1; i < Camera::maximumPresets; ++i) {
        askPtz("SetPreset", "");
    }
    expectPtzFault("SetPreset", "", "TooManyPresets");
}

TEST_F(Onvif, focusIsAutomaticOrMovesAbsolutelyRelativelyAndContinuously) {
    const std::string video = "<VideoSourceToken>video</VideoSourceToken>";
    const auto settings = [&] { return ask(call(imagingSpace, "GetImagingSettings", video)); };
    const auto move = [&](const std::string& how) {
        ask(call(imagingSpace, "Move", video + "<Focus>" + how + "</Focus>"));
    };
    EXPECT_THAT(settings(), HasSubstr(">AUTO<"));
    move("<Absolute><Position>0.75</Position></Absolute>");
    m_now += 1h;
    EXPECT_THAT(settings(), HasSubstr(">MANUAL<"));
    move("<Relative><Distance>-0.5</Distance></Relative>");
    m_now += 1h;
    EXPECT_EQ(m_camera->state().focus, 0.25);
    move("<Continuous><Speed>1</Speed></Continuous>");
    m_now += 500ms;
    EXPECT_THAT(ask(call(imagingSpace, "GetStatus", video)), HasSubstr(">MOVING<"));
    ask(call(imagingSpace, "Stop", video));
    m_now += 1h;
    EXPECT_NEAR(m_camera->state().focus, 0.25 + 0.5 * Camera::focusRate, near);
    ask(call(imagingSpace, "SetImagingSettings",
             video + "<ImagingSettings><Focus><AutoFocusMode>AUTO</AutoFocusMode></Focus></ImagingSettings>"));
    m_now += 1h;
    EXPECT_EQ(m_camera->state().focus, Camera::sharpFocus);
}

TEST_F(Onvif, focusOutOfRangeIsRefused) {
    const std::string video = "<VideoSourceToken>video</VideoSourceToken>";
    const auto refuse = [&](const std::string& how) {
        expectFault(call(imagingSpace, "Move", video + "<Focus>" + how + "</Focus>"), "SettingsInvalid");
    };
    for (const char* wrong : {"NaN", "1.01", "-1.01", "INF", "x", ""}) {
        refuse(std::string("<Absolute><Position>") + wrong + "</Position></Absolute>");
        refuse(std::string("<Relative><Distance>") + wrong + "</Distance></Relative>");
        refuse(std::string("<Continuous><Speed>") + wrong + "</Speed></Continuous>");
    }
    expectFault(call(imagingSpace, "Move", video), "NoImagingForSource");
    expectFault(call(imagingSpace, "SetImagingSettings",
                     video + "<ImagingSettings><Focus><AutoFocusMode>SOON</AutoFocusMode></Focus></ImagingSettings>"),
                "SettingsInvalid");
    EXPECT_TRUE(m_camera->state().automaticFocus);
}

TEST_F(Onvif, whatIsNoRequestGetsAFault) {
    const std::string good = soap(call(ptzSpace, "GetNodes"));
    EXPECT_EQ(answer(good).status, 200);
    const std::string two = soap(call(ptzSpace, "GetNodes") + call(ptzSpace, "GetNodes"));
    std::string twoEnvelopes = good + good;
    for (const std::string& wrong :
         {std::string(), std::string("hello"), good.substr(0, good.size() / 2), std::string("<a/>"), soap(""), two,
          twoEnvelopes, std::string("\0\1\2", 3), std::string("<s:Envelope/>"),
          soap(std::string(XmlDocument::maximumBytes, ' ') + call(ptzSpace, "GetNodes"))}) {
        const OnvifAnswer found = answer(wrong);
        EXPECT_EQ(found.status, 400) << wrong.substr(0, 99);
        EXPECT_THAT(found.body, HasSubstr("ter:WellFormed"));
        EXPECT_TRUE(XmlDocument::parse(found.body)) << found.body;
    }
}

TEST_F(Onvif, aDocumentTypeIsRefusedBeforeAnythingInItIsRead) {
    std::string bomb = "<!DOCTYPE x [<!ENTITY a \"aaaaaaaaaa\">";
    for (char entity = 'b'; entity <= 'z'; ++entity) {
        bomb += std::string("<!ENTITY ") + entity + " \"";
        for (int i = 0; i < 20; ++i) {
            bomb += std::string("&") + static_cast<char>(entity - 1) + ";";
        }
        bomb += "\">";
    }
    const std::string envelope = soap(call(ptzSpace, "GetStatus", "<ProfileToken>&z;</ProfileToken>"));
    EXPECT_THAT(answer(bomb + "]>" + envelope).body, HasSubstr("ter:WellFormed"));
    const std::string file = "<!DOCTYPE x [<!ENTITY z SYSTEM \"file:///etc/hostname\">]>";
    EXPECT_THAT(answer(file + envelope).body, HasSubstr("ter:WellFormed"));
    const std::string plain = "<!DOCTYPE x>" + soap(call(ptzSpace, "GetNodes"));
    EXPECT_THAT(answer(plain).body, HasSubstr("ter:WellFormed"));
    EXPECT_THAT(answer(envelope).body, HasSubstr("ter:WellFormed")) << "an entity that nobody declared";
}

TEST_F(Onvif, deepNestingIsRefused) {
    std::string deep;
    for (int i = 0; i < 5000; ++i) {
        deep += "<a>";
    }
    EXPECT_THAT(answer(soap(deep)).body, HasSubstr("ter:WellFormed"));
    std::string closed = deep;
    for (int i = 0; i < 5000; ++i) {
        closed += "</a>";
    }
    EXPECT_THAT(answer(soap(closed)).body, HasSubstr("ter:WellFormed"));
}

TEST_F(Onvif, olderSoapAndUnknownOperationsAreTold) {
    const OnvifAnswer old = answer("<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\"><s:Body>" +
                                   call(ptzSpace, "GetNodes") + "</s:Body></s:Envelope>");
    EXPECT_THAT(old.body, HasSubstr("env:VersionMismatch"));
    for (const std::string& unknown :
         {call(ptzSpace, "Explode"), call(mediaSpace, "GetNodes"), call("", "GetNodes"), call("urn:x", "GetNodes")}) {
        expectFault(unknown, "ActionNotSupported");
    }
}

TEST_F(Onvif, theClockIsUtc) {
    const std::string answered = ask(call(deviceSpace, "GetSystemDateAndTime"));
    const std::time_t now = std::time(nullptr);
    std::tm utc{};
    gmtime_r(&now, &utc);
    EXPECT_THAT(answered, HasSubstr("<tt:Year>" + std::to_string(utc.tm_year + 1900) + "</tt:Year>"));
    EXPECT_THAT(answered, HasSubstr("<tt:UTCDateTime>"));
}

TEST_F(Onvif, everyCameraHasAnIdentityThatStays) {
    OnvifCamera other = m_device->camera();
    EXPECT_EQ(other.uuid(), m_device->camera().uuid());
    other.source = "Cam 2";
    EXPECT_NE(other.uuid(), m_device->camera().uuid());
    EXPECT_THAT(other.uuid(), testing::MatchesRegex("[0-9a-f]{8}-[0-9a-f]{4}-5[0-9a-f]{3}-a[0-9a-f]{3}-[0-9a-f]{12}"));
}

TEST(Duration, isReadInEveryWayThatXmlSchemaWritesIt) {
    EXPECT_EQ(durationIn("PT5S"), 5s);
    EXPECT_EQ(durationIn("PT0.25S"), 250ms);
    EXPECT_EQ(durationIn("PT1M"), 1min);
    EXPECT_EQ(durationIn("PT1M0.5S"), 60500ms);
    EXPECT_EQ(durationIn("P0DT1H2M3S"), 3723s);
    EXPECT_EQ(durationIn("P1D"), 24h);
    EXPECT_EQ(durationIn("-PT2S"), -2s);
    EXPECT_EQ(durationIn("PT0S"), 0s);
    for (const char* wrong : {"", "P", "PT", "P1", "1S", "PT1", "PT1S2M", "PTM", "P1S", "PT1D", "PT.S", "PT1.5M", "P1Y",
                              "--PT1S", "PT-1S", "PT1ST1S", "P400D", "PT1S "}) {
        EXPECT_FALSE(durationIn(wrong)) << wrong;
    }
}

} // namespace
} // namespace qivo::test

#include "tools/publish/onvif/Discovery.h"
#include "tests/tools/OnvifFixture.h"

namespace qivo::test {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

std::string probe(const std::string& types, const std::string& scopes = {}, const std::string& replyTo = {}) {
    return "<e:Envelope xmlns:e=\"http://www.w3.org/2003/05/soap-envelope\" "
           "xmlns:w=\"http://schemas.xmlsoap.org/ws/2004/08/addressing\" "
           "xmlns:n=\"http://www.onvif.org/ver10/network/wsdl\"><e:Header><w:MessageID>uuid:42</w:MessageID>" +
           replyTo +
           "</e:Header><e:Body><Probe xmlns=\"http://schemas.xmlsoap.org/ws/2005/04/discovery\" "
           "xmlns:t=\"http://www.onvif.org/ver10/device/wsdl\">" +
           types + scopes + "</Probe></e:Body></e:Envelope>";
}

class Discovery : public OnvifFixture {
  protected:
    std::vector<std::string> answers(const std::string& datagram) {
        return m_messages.answers(datagram, {&m_device->camera(), &m_second}, {"10.0.0.5", 8080});
    }

    OnvifCamera m_second{"STUDIO", "Cam 2", "/source-2/onvif/", m_camera, {}, 8554};
    DiscoveryMessages m_messages;
};

TEST_F(Discovery, everyCameraAnswersForItselfWithItsAddress) {
    const auto found = answers(probe("<Types>n:NetworkVideoTransmitter</Types>"));
    ASSERT_THAT(found, SizeIs(2));
    EXPECT_THAT(found[0], HasSubstr("<d:XAddrs>http://10.0.0.5:8080/source-1/onvif/device_service</d:XAddrs>"));
    EXPECT_THAT(found[1], HasSubstr("<d:XAddrs>http://10.0.0.5:8080/source-2/onvif/device_service</d:XAddrs>"));
    EXPECT_THAT(found[0], HasSubstr("urn:uuid:" + m_device->camera().uuid()));
    for (const std::string& one : found) {
        EXPECT_TRUE(XmlDocument::parse(one));
        EXPECT_THAT(one, HasSubstr("<wsa:RelatesTo>uuid:42</wsa:RelatesTo>"));
        EXPECT_THAT(one, HasSubstr("<d:Types>dn:NetworkVideoTransmitter tds:Device</d:Types>"));
        EXPECT_THAT(one, HasSubstr("addressing/role/anonymous</wsa:To>"));
    }
}

TEST_F(Discovery, probesForTypesThatACameraIsAreAnswered) {
    EXPECT_THAT(answers(probe("")), SizeIs(2));
    EXPECT_THAT(answers(probe("<Types/>")), SizeIs(2));
    EXPECT_THAT(answers(probe("<Types>t:Device</Types>")), SizeIs(2));
    EXPECT_THAT(answers(probe("<Types>t:Device n:NetworkVideoTransmitter</Types>")), SizeIs(2));
    EXPECT_THAT(answers(probe("<Types xmlns=\"http://www.onvif.org/ver10/device/wsdl\">Device</Types>")), SizeIs(2));
}

TEST_F(Discovery, probesForOtherThingsAreNot) {
    for (const char* types : {"n:NetworkVideoDisplay", "n:Device", "x:NetworkVideoTransmitter",
                              "NetworkVideoTransmitter", "n:NetworkVideoTransmitter t:Printer", ":", "n:"}) {
        EXPECT_THAT(answers(probe(std::string("<Types>") + types + "</Types>")), IsEmpty()) << types;
    }
}

TEST_F(Discovery, scopesAreMatchedByWholeSteps) {
    const auto scoped = [&](const std::string& scopes, const std::string& rule = {}) {
        return answers(probe("", "<Scopes" + rule + ">" + scopes + "</Scopes>")).size();
    };
    EXPECT_EQ(scoped(""), 2U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/type/ptz"), 2U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/type"), 2U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/"), 2U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/name/STUDIO%20%28Cam%202%29"), 1U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/type/p"), 0U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/type/ptz onvif://www.onvif.org/location/x"), 0U);
    const std::string exact = " MatchBy=\"http://schemas.xmlsoap.org/ws/2005/04/discovery/strcmp0\"";
    EXPECT_EQ(scoped("onvif://www.onvif.org/type/ptz", exact), 2U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/type", exact), 0U);
    EXPECT_EQ(scoped("onvif://www.onvif.org/type/ptz", " MatchBy=\"urn:other\""), 0U);
}

TEST_F(Discovery, theAnswerIsAddressedAsTheProbeWants) {
    const auto found = answers(probe("", "", "<w:ReplyTo><w:Address>urn:me&amp;you</w:Address></w:ReplyTo>"));
    ASSERT_THAT(found, SizeIs(2));
    EXPECT_THAT(found[0], HasSubstr("<wsa:To>urn:me&amp;you</wsa:To>"));
}

TEST_F(Discovery, messagesAreNumbered) {
    const auto found = answers(probe(""));
    ASSERT_THAT(found, SizeIs(2));
    EXPECT_THAT(found[0], HasSubstr("MessageNumber=\"1\""));
    EXPECT_THAT(found[1], HasSubstr("MessageNumber=\"2\""));
}

TEST_F(Discovery, whatIsNoProbeIsNotAnswered) {
    const std::string good = probe("");
    for (const std::string& wrong :
         {std::string(), std::string("x"), good.substr(0, 200), "<!DOCTYPE x [<!ENTITY a \"b\">]>" + good,
          good + std::string(XmlDocument::maximumBytes, ' '), soap(call(deviceSpace, "Probe")), answers(good)[0]}) {
        EXPECT_THAT(answers(wrong), IsEmpty()) << wrong.substr(0, 99);
    }
}

TEST_F(Discovery, helloAndByeNameTheCamera) {
    const std::string hello = m_messages.hello(m_second, {"10.0.0.5", 8080});
    const std::string bye = m_messages.bye(m_second);
    EXPECT_TRUE(XmlDocument::parse(hello));
    EXPECT_THAT(hello, HasSubstr("<d:Hello><wsa:EndpointReference><wsa:Address>urn:uuid:" + m_second.uuid()));
    EXPECT_THAT(hello, HasSubstr("http://10.0.0.5:8080/source-2/onvif/device_service"));
    EXPECT_THAT(bye, HasSubstr("<d:Bye><wsa:EndpointReference><wsa:Address>urn:uuid:" + m_second.uuid()));
    EXPECT_THAT(answers(hello), IsEmpty());
}

} // namespace
} // namespace qivo::test

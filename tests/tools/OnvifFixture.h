#pragma once

#include "tools/publish/onvif/Onvif.h"
#include "tools/publish/onvif/Services.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

namespace qivo::test {

/// A request with an operation's XML in its body.
inline std::string soap(const std::string& operation, const std::string& header = {}) {
    return "<s:Envelope xmlns:s=\"http://www.w3.org/2003/05/soap-envelope\"><s:Header>" + header +
           "</s:Header><s:Body>" + operation + "</s:Body></s:Envelope>";
}

/// An operation of a service, with what stands in it.
inline std::string call(const std::string& space, const std::string& name, const std::string& content = {}) {
    return "<" + name + " xmlns=\"" + space + "\">" + content + "</" + name + ">";
}

/// A camera with two streams, and time of its own.
class OnvifFixture : public testing::Test {
  protected:
    OnvifFixture() { makeDevice(nullptr); }

    void makeDevice(std::shared_ptr<UsernameTokens> tokens) {
        m_device = std::make_unique<OnvifDevice>(
            OnvifCamera{"STUDIO",
                        "Cam & <1>",
                        "/source-1/onvif/",
                        m_camera,
                        {{"full", "Full", "/source-1", {1280, 720}, {30, 1}, Codec::h264, 3000},
                         {"low", "Low", "/source-1/low", {320, 180}, {15, 1}, Codec::h264, 200}},
                        8554},
            std::move(tokens));
    }

    OnvifAnswer answer(const std::string& request) { return m_device->answer(request, m_place, false); }

    /// The answer to a call that must succeed.
    std::string ask(const std::string& operation) {
        const OnvifAnswer found = answer(soap(operation));
        EXPECT_EQ(found.status, 200) << found.body;
        EXPECT_TRUE(XmlDocument::parse(found.body)) << found.body;
        return found.body;
    }
    std::string askPtz(const std::string& name, const std::string& content, const std::string& profile = "full") {
        return ask(call(ptzSpace, name, "<ProfileToken>" + profile + "</ProfileToken>" + content));
    }

    /// Expects that a call is refused for an ONVIF reason.
    void expectFault(const std::string& operation, const std::string& subcode) {
        const OnvifAnswer found = answer(soap(operation));
        EXPECT_NE(found.status, 200) << operation;
        EXPECT_TRUE(XmlDocument::parse(found.body)) << found.body;
        EXPECT_THAT(found.body, testing::HasSubstr("<env:Fault>"));
        EXPECT_THAT(found.body, testing::HasSubstr("<env:Value>ter:" + subcode + "</env:Value>")) << operation;
    }
    void expectPtzFault(const std::string& name, const std::string& content, const std::string& subcode) {
        expectFault(call(ptzSpace, name, "<ProfileToken>full</ProfileToken>" + content), subcode);
    }

    Camera::Time m_now{};
    std::shared_ptr<Camera> m_camera = std::make_shared<Camera>([this] { return m_now; });
    OnvifPlace m_place{"192.168.7.8", 8080};
    std::unique_ptr<OnvifDevice> m_device;
};

} // namespace qivo::test

#include "tests/tools/Publisher.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;
using testing::HasSubstr;

struct Outcome {
    std::optional<int> code;
    std::string output;
};

Outcome run(const std::string& command) {
    const auto process =
        Process::start({"/bin/sh", "-c", command + " 2>&1"}, {"NODE_PATH=" NODE_MODULES, "HOME=/nonexistent"});
    const auto code = process->wait(60s);
    return {code, process->output() + process->errors()};
}

std::vector<std::string> twoCameras(const std::vector<std::string>& more = {}) {
    std::vector<std::string> arguments{"--machine", "STUDIO", "--ptz", "--source", "Cam 1", "--source", "Cam 2"};
    arguments.insert(arguments.begin(), more.begin(), more.end());
    return arguments;
}

void expectSteered(const Outcome& result, const std::string& stream) {
    EXPECT_EQ(result.code, 0) << result.output;
    for (const std::string& line :
         {std::string("{\"found\":2}"), "{\"stream\":\"" + stream + "\"}",
          std::string("{\"profiles\":[\"Full\",\"Low bandwidth\"]}"), std::string("{\"nodes\":[\"head\"]}"),
          std::string("\"moveStatus\":{\"panTilt\":\"MOVING\",\"zoom\":\"MOVING\"}"), std::string("{\"stands\":true}"),
          std::string("{\"timeout\":true}"), std::string("{\"absolute\":{\"x\":-0.2,\"y\":0.1,\"zoom\":0.3}}"),
          std::string("{\"relative\":{\"x\":-0.1,\"y\":0.1,\"zoom\":0.3}}"), std::string("{\"presets\":[\"Door\"]}"),
          std::string("{\"recalled\":true}"), std::string("{\"left\":[]}"), std::string("no preset of this token"),
          std::string("{\"focus\":\"MANUAL\"}")}) {
        EXPECT_THAT(result.output, HasSubstr(line));
    }
}

TEST(PtzPeers, theOnvifPackageFindsReadsMovesStopsAndRecalls) {
    const PublishProcess publisher(twoCameras(), 8);
    expectSteered(run("node " SCRIPTS "/onvif-peer.js /source-2"), publisher.address(4));
}

TEST(PtzPeers, theOnvifPackageDoesSoWithALogin) {
    const PublishProcess publisher(twoCameras({"--login", "admin:se:cret"}), 8);
    expectSteered(run("node " SCRIPTS "/onvif-peer.js /source-1 admin se:cret"), publisher.address(0));
    const Outcome wrong = run("node " SCRIPTS "/onvif-peer.js /source-1 admin wrong");
    EXPECT_EQ(wrong.code, 1);
    EXPECT_THAT(wrong.output, HasSubstr("not authorized"));
}

TEST(PtzPeers, onvifUtilFindsBothCameras) {
    const PublishProcess publisher(twoCameras(), 8);
    const Outcome result = run("onvif-util -a </dev/null");
    EXPECT_THAT(result.output, HasSubstr("Found 2 cameras"));
    EXPECT_THAT(result.output, HasSubstr("STUDIO (Cam 1)"));
    EXPECT_THAT(result.output, HasSubstr("STUDIO (Cam 2)"));
}

TEST(PtzPeers, onvifUtilReadsProfilesStreamAddressAndTime) {
    const PublishProcess publisher({"--machine", "STUDIO", "--ptz", "--login", "admin:secret"}, 4);
    const Outcome result = run("printf 'get profiles\\nget rtsp\\nget time\\nget video\\nquit\\n' | "
                               "onvif-util -u admin -p secret 127.0.0.1");
    EXPECT_EQ(result.code, 0) << result.output;
    for (const std::string& line :
         {std::string("successfully connected to host"), std::string("Token 0: full"), std::string("Token 1: low"),
          publisher.address(0).substr(std::string("rtsp://").size()), std::string("Time Offset: 0 seconds"),
          std::string("Resolution: 1280 x 720")}) {
        EXPECT_THAT(result.output, HasSubstr(line));
    }
}

} // namespace
} // namespace qivo::test

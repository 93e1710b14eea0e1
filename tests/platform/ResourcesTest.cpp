#include "platform/Resources.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace qivo {
namespace {

TEST(Resources, LieInTheSharedDirectoryBesideTheProgramsOwn) {
    const auto programs = std::filesystem::read_symlink("/proc/self/exe").parent_path();
    EXPECT_EQ(resourcePath(), (programs.parent_path() / "share" / "qivo-viewer").string());
}

TEST(Resources, OfTheBuildTreeHoldTheShaders) {
    for (const char* name : {"Quad2D.vs", "Quad2D.fs", "QuadRect.vs", "QuadRect.fs"}) {
        EXPECT_TRUE(std::filesystem::is_regular_file(resourcePath() + "/" + name)) << name;
    }
}

TEST(Resources, CanBeTakenFromElsewhereAndBack) {
    const std::string standard = resourcePath();
    setResourcePath("/elsewhere");
    EXPECT_EQ(resourcePath(), "/elsewhere");
    setResourcePath("");
    EXPECT_EQ(resourcePath(), standard);
}

} // namespace
} // namespace qivo

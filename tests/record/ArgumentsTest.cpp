#include "tools/record/Arguments.h"

#include <algorithm>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace qivo::record {
namespace {

using testing::HasSubstr;
using Words = std::vector<std::string>;

const Words kAll = {"-i", "STUDIO (Cam 1)", "-o", "/m/STUDIO (Cam 1).mov", "-orvane", "-nothumbnail"};

TEST(RecordArguments, SixInTheLaunchersOrder) {
    const auto parsed = parseArguments(kAll);
    const auto* arguments = std::get_if<Arguments>(&parsed);
    ASSERT_NE(arguments, nullptr);
    EXPECT_EQ(arguments->source, "STUDIO (Cam 1)");
    EXPECT_EQ(arguments->output, "/m/STUDIO (Cam 1).mov");
}

TEST(RecordArguments, AnyOrder) {
    std::vector<Words> groups = {{"-i", "A"}, {"-nothumbnail"}, {"-o", "b.mov"}, {"-orvane"}};
    std::sort(groups.begin(), groups.end());
    int orders = 0;
    do {
        Words words;
        for (const Words& group : groups) {
            words.insert(words.end(), group.begin(), group.end());
        }
        const auto parsed = parseArguments(words);
        const auto* arguments = std::get_if<Arguments>(&parsed);
        ASSERT_NE(arguments, nullptr) << testing::PrintToString(words);
        EXPECT_EQ(arguments->source + arguments->output, "Ab.mov");
        ++orders;
    } while (std::next_permutation(groups.begin(), groups.end()));
    EXPECT_EQ(orders, 24);
}

TEST(RecordArguments, ValuesThatLookLikeFlagsAreValues) {
    const auto parsed = parseArguments({"-i", "-o", "-o", "-i", "-orvane", "-nothumbnail"});
    const auto* arguments = std::get_if<Arguments>(&parsed);
    ASSERT_NE(arguments, nullptr);
    EXPECT_EQ(arguments->source, "-o");
    EXPECT_EQ(arguments->output, "-i");
}

struct Wrong {
    Words words;
    std::string says;
};

class RecordArgumentsRefused : public testing::TestWithParam<Wrong> {};

TEST_P(RecordArgumentsRefused, WithTheReasonAndTheUsage) {
    const auto parsed = parseArguments(GetParam().words);
    const auto* error = std::get_if<UsageError>(&parsed);
    ASSERT_NE(error, nullptr);
    EXPECT_EQ(error->text, "Application.Mac.QIVO.Recording: " + GetParam().says +
                               "\nusage: Application.Mac.QIVO.Recording -i SOURCE -o FILE.mov -orvane -nothumbnail\n");
}

INSTANTIATE_TEST_SUITE_P(
    Each, RecordArgumentsRefused,
    testing::Values(Wrong{{}, "-i is missing"}, Wrong{{"-i", "A", "-o", "b", "-orvane"}, "-nothumbnail is missing"},
                    Wrong{{"-i", "A", "-o", "b", "-nothumbnail"}, "-orvane is missing"},
                    Wrong{{"-i", "A", "-orvane", "-nothumbnail"}, "-o is missing"},
                    Wrong{{"-orvane", "-nothumbnail", "-o", "b"}, "-i is missing"},
                    Wrong{{"-orvane", "-nothumbnail", "-o", "b", "-i"}, "-i needs a value"},
                    Wrong{{"-i", "", "-o", "b", "-orvane", "-nothumbnail"}, "-i is empty"},
                    Wrong{{"-i", "A", "-o", "", "-orvane", "-nothumbnail"}, "-o is empty"},
                    Wrong{{"-i", "A", "-o", "b", "-orvane", "-nothumbnail", "-x"}, "unknown argument \"-x\""},
                    Wrong{{"-i", "A", "-o", "b", "-orvane", "-nothumbnail", "more"}, "unknown argument \"more\""},
                    Wrong{{"-i", "A", "-i", "B", "-o", "b", "-orvane", "-nothumbnail"}, "-i is given twice"},
                    Wrong{{"-i", "A", "-o", "b", "-orvane", "-orvane", "-nothumbnail"}, "-orvane is given twice"}));

} // namespace
} // namespace qivo::record

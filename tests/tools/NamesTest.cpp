#include "tools/publish/Names.h"

#include <gtest/gtest.h>

namespace qivo {
namespace {

TEST(Names, utf8IsCheckedByItsRules) {
    for (const char* good : {"", "plain",
                             "K\xC3\xBC"
                             "che",
                             "\xE3\x82\xAB\xE3\x83\xA1\xE3\x83\xA9", "\xF0\x9F\x93\xB7"}) {
        EXPECT_TRUE(isUtf8(good)) << good;
    }
    for (const char* bad :
         {"\xC3", "\x80", "\xC0\xAF", "\xE0\x80\xAF", "\xED\xA0\x80", "\xF4\x90\x80\x80", "\xFF", "a\xC3z"}) {
        EXPECT_FALSE(isUtf8(bad)) << bad;
    }
}

TEST(Names, controlCharactersAreFound) {
    for (const char* bad : {"a\nb", "\x1B[31m", "\x7F", "\xC2\x85"}) {
        EXPECT_TRUE(hasControlCharacter(bad));
    }
    EXPECT_FALSE(hasControlCharacter("Stage \xC2\xA0 left"));
}

TEST(Names, instanceNameJoinsMachineAndSource) {
    EXPECT_EQ(instanceName("STUDIO", "Cam 1"), "STUDIO (Cam 1)");
}

TEST(Names, machineWithABlankAndAParenthesisIsRefusedAndSaysWhy) {
    EXPECT_EQ(machineNameProblem("A (B"),
              "--machine \"A (B\": viewers take what stands before the first \" (\" of a name "
              "as the machine; leave \" (\" out");
    EXPECT_EQ(machineNameProblem("A(B"), "");
    EXPECT_EQ(machineNameProblem(""), "--machine: the name is empty; give one");
}

TEST(Names, longestInstanceNameIsTakenAndOneByteMoreRefused) {
    const std::string machine = "STUDIO";
    const std::string longest(maximumInstanceNameBytes - instanceName(machine, "").size(), 'x');
    EXPECT_EQ(sourceNameProblem(machine, longest), "");
    EXPECT_EQ(sourceNameProblem(machine, longest + "x"), "\"STUDIO (" + longest +
                                                             "x)\" is too long to be announced: 64 bytes, at most 63; "
                                                             "shorten --machine or --source");
}

TEST(Names, lengthCountsBytesNotCharacters) {
    std::string source;
    for (int i = 0; i < 28; ++i) {
        source += "\xC3\xA4";
    }
    EXPECT_NE(sourceNameProblem("STUDIO", source), "");
}

TEST(Names, sourceNamesOfDamagedTextAreRefused) {
    EXPECT_EQ(sourceNameProblem("M", "\xC3"),
              "--source: the name is not valid UTF-8; check the terminal's or script's encoding");
    EXPECT_EQ(sourceNameProblem("M", "a\tb"), "--source: the name holds a control character; leave it out");
    EXPECT_EQ(sourceNameProblem("M", "Cam (wide)"), "");
}

TEST(Names, alternativesKeepTheFormAndFit) {
    EXPECT_EQ(alternativeInstanceName("STUDIO", "Cam 1", 2), "STUDIO (Cam 1 #2)");
    std::string source;
    for (int i = 0; i < 27; ++i) {
        source += "\xC3\xA4";
    }
    const std::string tight = alternativeInstanceName("STUDIO", source, 12);
    EXPECT_LE(tight.size(), maximumInstanceNameBytes);
    EXPECT_TRUE(isUtf8(tight));
    EXPECT_EQ(tight.substr(tight.size() - 5), " #12)");
    const std::string narrow = alternativeInstanceName(std::string(59, 'M'), "x", 2);
    EXPECT_LE(narrow.size(), maximumInstanceNameBytes);
    EXPECT_EQ(narrow.substr(narrow.size() - 6), " ( #2)");
}

TEST(Names, cuttingNeverSplitsACharacter) {
    EXPECT_EQ(cutUtf8("a\xE3\x82\xAB", 3), "a");
    EXPECT_EQ(cutUtf8("a\xE3\x82\xAB", 4), "a\xE3\x82\xAB");
    EXPECT_EQ(cutUtf8("\xC3\xA4", 1), "");
}

} // namespace
} // namespace qivo

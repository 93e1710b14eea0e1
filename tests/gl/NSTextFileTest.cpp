#include "gl/NSTextFile.h"

#include "tests/gl/ResourceDirectory.h"
#include "tests/platform/LogCapture.h"
#include "tests/platform/TemporaryDirectory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

namespace qivo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::StrEq;

class NSTextFileTest : public testing::Test {
  protected:
    TemporaryDirectory directory;
    LogCapture log;
};

TEST_F(NSTextFileTest, LoadsAFile) {
    const auto path = directory.write("text", "void main()\n{\n}\n");
    EXPECT_THAT(NSTextFile::initWithFile(path.c_str())->source(), StrEq("void main()\n{\n}\n"));
    EXPECT_THAT(NSTextFile::textWithFile(path.c_str())->source(), StrEq("void main()\n{\n}\n"));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(NSTextFileTest, LoadsAUrl) {
    const auto url = "file://" + directory.write("text", "from a url");
    EXPECT_THAT(NSTextFile::initWithURL(url.c_str())->source(), StrEq("from a url"));
    EXPECT_THAT(NSTextFile::textWithURL(url.c_str())->source(), StrEq("from a url"));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(NSTextFileTest, LoadsAResource) {
    const ResourceDirectory resources;
    resources.write("Name.ext", "a resource");
    EXPECT_THAT(NSTextFile::initWithResource("Name", "ext")->source(), StrEq("a resource"));
    EXPECT_THAT(NSTextFile::textWithResource("Name", "ext")->source(), StrEq("a resource"));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(NSTextFileTest, AnEmptyFileGivesAnEmptySource) {
    const auto text = NSTextFile::initWithFile(directory.write("text", "").c_str());
    ASSERT_NE(text->source(), nullptr);
    EXPECT_THAT(text->source(), StrEq(""));
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST_F(NSTextFileTest, AMissingFileIsLoggedTwice) {
    const auto path = directory.path("none");
    EXPECT_EQ(NSTextFile::initWithFile(path.c_str())->source(), nullptr);
    EXPECT_THAT(log.take(),
                ElementsAre(">> " + path + ": No such file or directory",
                            ">> ERROR: Failed acquiring sources from the file at pathname \"" + path + "\""));
}

TEST_F(NSTextFileTest, AMissingFileOfAUrlIsLoggedTwice) {
    const auto path = directory.path("none");
    EXPECT_EQ(NSTextFile::initWithURL(("file://" + path).c_str())->source(), nullptr);
    EXPECT_THAT(log.take(), ElementsAre(">> " + path + ": No such file or directory",
                                        ">> ERROR: Failed acquiring sources from the url <file://" + path + ">"));
}

TEST_F(NSTextFileTest, AMissingResourceIsLoggedTwice) {
    const ResourceDirectory resources;
    EXPECT_EQ(NSTextFile::initWithResource("None", "vs")->source(), nullptr);
    EXPECT_THAT(log.take(),
                ElementsAre(">> " + resources.path("None.vs") + ": No such file or directory",
                            ">> ERROR: Failed acquiring sources from the \"None.vs' at application's bunble!"));
}

TEST_F(NSTextFileTest, AResourceWithoutNameOrExtensionIsLoggedOnce) {
    EXPECT_EQ(NSTextFile::initWithResource(nullptr, "vs")->source(), nullptr);
    EXPECT_THAT(log.take(),
                ElementsAre(">> ERROR: Failed acquiring sources from the \"(null).vs' at application's bunble!"));
    EXPECT_EQ(NSTextFile::initWithResource("Name", nullptr)->source(), nullptr);
    EXPECT_THAT(log.take(),
                ElementsAre(">> ERROR: Failed acquiring sources from the \"Name.(null)' at application's bunble!"));
}

TEST_F(NSTextFileTest, NullNamesNoFileAndNoUrl) {
    EXPECT_EQ(NSTextFile::initWithFile(nullptr)->source(), nullptr);
    EXPECT_THAT(log.take(), ElementsAre(">> No file name was given",
                                        ">> ERROR: Failed acquiring sources from the file at pathname \"(null)\""));
    EXPECT_EQ(NSTextFile::initWithURL(nullptr)->source(), nullptr);
    EXPECT_THAT(log.take(),
                ElementsAre(">> No URL was given", ">> ERROR: Failed acquiring sources from the url <(null)>"));
}

TEST_F(NSTextFileTest, AUrlOfAnotherSchemeIsLoggedTwice) {
    EXPECT_EQ(NSTextFile::initWithURL("http://127.0.0.1/a")->source(), nullptr);
    EXPECT_THAT(log.take(), ElementsAre(">> http://127.0.0.1/a: Only file URLs can be read",
                                        ">> ERROR: Failed acquiring sources from the url <http://127.0.0.1/a>"));
}

TEST_F(NSTextFileTest, AcceptsEvery7BitCharacter) {
    std::string characters;
    for (char character = 1; character < 127; ++character) {
        characters += character;
    }
    characters += '\x7F';
    const auto text = NSTextFile::initWithFile(directory.write("text", characters).c_str());
    EXPECT_THAT(text->source(), StrEq(characters));
}

TEST_F(NSTextFileTest, RefusesBytesOutsideAscii) {
    const auto path = directory.write("text", "caf\xC3\xA9");
    EXPECT_EQ(NSTextFile::initWithFile(path.c_str())->source(), nullptr);
    EXPECT_THAT(log.take(),
                ElementsAre(">> " + path + ": Byte 195 at offset 3 is not ASCII",
                            ">> ERROR: Failed acquiring sources from the file at pathname \"" + path + "\""));
}

TEST_F(NSTextFileTest, RefusesTheLowestByteOutsideAscii) {
    const auto path = directory.write("text", "\x80");
    EXPECT_EQ(NSTextFile::initWithFile(path.c_str())->source(), nullptr);
    EXPECT_THAT(log.take(), testing::Contains(">> " + path + ": Byte 128 at offset 0 is not ASCII"));
}

TEST_F(NSTextFileTest, EndsAtANulByte) {
    const auto path = directory.write("text", std::string("before\0after", 12));
    EXPECT_THAT(NSTextFile::initWithFile(path.c_str())->source(), StrEq("before"));
}

TEST_F(NSTextFileTest, LoadsUpToTheLimit) {
    const auto path = directory.write("text", std::string(NSTextFile::maximumBytes, 'x'));
    EXPECT_EQ(std::string(NSTextFile::initWithFile(path.c_str())->source()).size(), NSTextFile::maximumBytes);
}

TEST_F(NSTextFileTest, RefusesAByteMoreThanTheLimit) {
    const auto path = directory.write("text", std::string(NSTextFile::maximumBytes + 1, 'x'));
    EXPECT_EQ(NSTextFile::initWithFile(path.c_str())->source(), nullptr);
    EXPECT_THAT(log.take(), testing::Contains(">> " + path + ": Larger than 1048576 bytes"));
}

TEST_F(NSTextFileTest, RefusesADirectory) {
    EXPECT_EQ(NSTextFile::initWithFile(directory.path().c_str())->source(), nullptr);
    EXPECT_THAT(log.take(), testing::Contains(">> " + directory.path() + ": Is a directory"));
}

} // namespace
} // namespace qivo

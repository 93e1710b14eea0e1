#include "runtime/Announcement.h"

#include <gtest/gtest.h>

namespace {

using namespace qivo::runtime;

TEST(AnnouncementTest, NamesAreUtf8WithoutControlCharactersWithinALabel) {
    EXPECT_TRUE(isSourceName("STUDIO (Cam 1)"));
    EXPECT_TRUE(isSourceName("K\xc3\xbc"
                             "che (\xe5\x85\xa5\xf0\x9f\x8e\xa5)"));
    EXPECT_TRUE(isSourceName(std::string(kMaxNameBytes, 'n')));
    EXPECT_FALSE(isSourceName(std::string(kMaxNameBytes + 1, 'n')));
    EXPECT_FALSE(isSourceName(""));
    for (const auto& bad :
         {std::string("a\0b", 3), std::string("a\n"), std::string("\x7f"), std::string("\xc2\x85"), std::string("\xff"),
          std::string("\xc0\x80"), std::string("\xe0\x80\xaf"), std::string("\xed\xa0\x80"),
          std::string("\xf4\x90\x80\x80"), std::string("\xc3"), std::string("\x80")}) {
        EXPECT_FALSE(isSourceName(bad)) << testing::PrintToString(bad);
    }
}

TEST(AnnouncementTest, PathsBecomeUrlPaths) {
    EXPECT_EQ(urlPath(""), "/");
    EXPECT_EQ(urlPath("live"), "/live");
    EXPECT_EQ(urlPath("/cam?channel=1&subtype=0"), "/cam?channel=1&subtype=0");
    EXPECT_EQ(urlPath("/a b\r\n#\"\xc3\xbc"), "/a%20b%0D%0A%23%22%C3%BC");
    EXPECT_EQ(urlPath("/100%"), "/100%25");
    EXPECT_EQ(urlPath("/a%20b%2"), "/a%20b%252");
}

TEST(AnnouncementTest, WebAddressesAreHttpOrHttpsWithAHost) {
    for (const char* good : {"http://camera/", "HTTPS://10.0.0.1:8443/x?y#z", "http://[fe80::1]:80/", "http://a",
                             "http://user@camera/", "http://a/%20"}) {
        EXPECT_TRUE(isWebAddress(good)) << good;
    }
    for (const char* bad : {"",
                            "http://",
                            "https:///x",
                            "ftp://a/",
                            "javascript:alert(1)",
                            "file:///etc/passwd",
                            "http:/a",
                            "http://a b/",
                            "http://a/\n",
                            "http://:80/",
                            "http://a:0/",
                            "http://a:65536/",
                            "http://a:x/",
                            "http://[]/",
                            "http://[::1/",
                            "http://@/",
                            "http://a\\b/",
                            "http://a/%zz",
                            " http://a/",
                            "xhttp://a/"}) {
        EXPECT_FALSE(isWebAddress(bad)) << bad;
    }
}

TEST(AnnouncementTest, TextKeysCountOnceAndWithoutCase) {
    const auto text =
        parseServiceText({"PATH=/one", "path=/two", "low", "low=/ignored", "=x", "Web=http://a/", "onvif=ftp://a/"});
    ASSERT_TRUE(text.has_value());
    EXPECT_EQ(text->path, "/one");
    EXPECT_EQ(text->low, "");
    EXPECT_EQ(text->web, "http://a/");
    EXPECT_EQ(text->onvif, "");
    EXPECT_EQ(parseServiceText({})->path, "/");
    EXPECT_EQ(parseServiceText({"low=sub"})->low, "/sub");
}

TEST(AnnouncementTest, TextHasBounds) {
    EXPECT_TRUE(parseServiceText({"x=" + std::string(kMaxTxtBytes - 3, 'x')}).has_value());
    EXPECT_FALSE(parseServiceText({"x=" + std::string(kMaxTxtBytes - 2, 'x')}).has_value());
    EXPECT_TRUE(parseServiceText({"path=" + std::string(kMaxPathBytes - 1, 'x')}).has_value());
    EXPECT_FALSE(parseServiceText({"path=" + std::string(kMaxPathBytes, 'x')}).has_value());
    EXPECT_FALSE(parseServiceText({"low=" + std::string(kMaxPathBytes / 3 + 1, ' ')}).has_value());
}

} // namespace

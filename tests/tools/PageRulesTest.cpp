#include "tools/publish/page/ControlPage.h"
#include "tools/publish/page/JsonObject.h"
#include "tools/publish/page/OriginRule.h"

#include <gtest/gtest.h>

namespace qivo::test {
namespace {

HttpRequest requestWith(std::vector<std::pair<std::string, std::string>> headers) {
    HttpRequest request;
    request.method = "POST";
    request.headers = std::move(headers);
    return request;
}

TEST(PageRules, hostsThatNameThisMachine) {
    for (const char* host : {"127.0.0.1", "127.0.0.1:8080", "192.168.1.7:8080", "[::1]:8080", "[fe80::1]", "localhost",
                             "LocalHost:8080", "studio:8080", "Studio.local", "STUDIO.LOCAL:1"}) {
        EXPECT_TRUE(namesThisMachine(requestWith({{"Host", host}}), "Studio")) << host;
    }
}

TEST(PageRules, hostsOfOthersThatWereMadeToLeadHere) {
    for (const char* host : {"", "evil.example", "evil.example:8080", "127.0.0.1.evil.example", "studio.evil.example",
                             "localhost.evil.example", "evil.local", "studio.local.", "127.0.0.1:x", "127.0.0.1:",
                             "127.0.0.1:123456", "127.0.0.1@evil.example", "[::1", "::1]:80", "studio:80:80"}) {
        EXPECT_FALSE(namesThisMachine(requestWith({{"Host", host}}), "Studio")) << host;
    }
    EXPECT_FALSE(namesThisMachine(requestWith({{"Host", "127.0.0.1"}, {"Host", "evil.example"}}), "Studio"));
    EXPECT_FALSE(namesThisMachine(requestWith({{"Host", ".local"}}), ""));
    EXPECT_FALSE(namesThisMachine(requestWith({}), "Studio"));
}

struct CommandCase {
    const char* what;
    std::vector<std::pair<std::string, std::string>> headers;
    bool allowed;
};

TEST(PageRules, commandsComeFromThePageItselfAsJson) {
    const std::pair<std::string, std::string> host{"Host", "10.0.0.5:8080"};
    const std::pair<std::string, std::string> own{"Origin", "http://10.0.0.5:8080"};
    const std::pair<std::string, std::string> json{"Content-Type", "application/json"};
    const std::vector<CommandCase> cases{
        {"the page's own", {host, own, json, {"Sec-Fetch-Site", "same-origin"}}, true},
        {"a browser without fetch metadata", {host, own, json}, true},
        {"a character set", {host, own, {"Content-Type", "Application/JSON; charset=utf-8"}}, true},
        {"no origin", {host, json, {"Sec-Fetch-Site", "same-origin"}}, false},
        {"a null origin", {host, {"Origin", "null"}, json}, false},
        {"another host", {host, {"Origin", "http://evil.example"}, json}, false},
        {"another port", {host, {"Origin", "http://10.0.0.5"}, json}, false},
        {"another scheme", {host, {"Origin", "https://10.0.0.5:8080"}, json}, false},
        {"an origin that only begins so", {host, {"Origin", "http://10.0.0.5:8080.evil.example"}, json}, false},
        {"two origins", {host, own, {"Origin", "http://evil.example"}, json}, false},
        {"cross-site", {host, own, json, {"Sec-Fetch-Site", "cross-site"}}, false},
        {"same-site", {host, own, json, {"Sec-Fetch-Site", "same-site"}}, false},
        {"typed into the address bar", {host, own, json, {"Sec-Fetch-Site", "none"}}, false},
        {"a form", {host, own, {"Content-Type", "application/x-www-form-urlencoded"}}, false},
        {"plain text", {host, own, {"Content-Type", "text/plain"}}, false},
        {"a type that only begins so", {host, own, {"Content-Type", "application/jsonp"}}, false},
        {"no type", {host, own}, false},
        {"nothing", {}, false}};
    for (const CommandCase& one : cases) {
        EXPECT_EQ(mayCommand(requestWith(one.headers)), one.allowed) << one.what;
    }
}

TEST(PageRules, picturesAreNotForOtherSites) {
    EXPECT_TRUE(mayLook(requestWith({})));
    EXPECT_TRUE(mayLook(requestWith({{"Sec-Fetch-Site", "same-origin"}})));
    EXPECT_TRUE(mayLook(requestWith({{"Sec-Fetch-Site", "none"}})));
    EXPECT_FALSE(mayLook(requestWith({{"Sec-Fetch-Site", "same-site"}})));
    EXPECT_FALSE(mayLook(requestWith({{"Sec-Fetch-Site", "cross-site"}})));
}

TEST(PageRules, jsonThatIsRead) {
    const auto object = readJsonObject(" { \"a\" : -1.5e-1, \"b\":true,\"c\":false ,\"d\":\"t \xC3\xA4\", \"\":0 } \n");
    ASSERT_TRUE(object);
    EXPECT_EQ(object->size(), 5U);
    EXPECT_EQ(member<double>(*object, "a"), -0.15);
    EXPECT_EQ(member<bool>(*object, "b"), true);
    EXPECT_EQ(member<bool>(*object, "c"), false);
    EXPECT_EQ(member<std::string>(*object, "d"), "t \xC3\xA4");
    EXPECT_EQ(member<double>(*object, "b"), std::nullopt);
    EXPECT_EQ(member<double>(*object, "none"), std::nullopt);
    EXPECT_TRUE(readJsonObject("{}"));
}

TEST(PageRules, jsonThatIsNotRead) {
    std::string many = "{\"0\":0";
    for (std::size_t i = 1; i <= maximumJsonMembers; ++i) {
        many += ",\"" + std::to_string(i) + "\":0";
    }
    for (const std::string& text : {std::string(),
                                    std::string("{"),
                                    std::string("}"),
                                    std::string("[]"),
                                    std::string("1"),
                                    std::string("null"),
                                    std::string("{\"a\"}"),
                                    std::string("{\"a\":}"),
                                    std::string("{\"a\":null}"),
                                    std::string("{\"a\":[1]}"),
                                    std::string("{\"a\":{}}"),
                                    std::string("{\"a\":1,}"),
                                    std::string("{\"a\":1 \"b\":2}"),
                                    std::string("{\"a\":1}x"),
                                    std::string("{\"a\":1,\"a\":2}"),
                                    std::string("{a:1}"),
                                    std::string("{'a':1}"),
                                    std::string("{\"a\":inf}"),
                                    std::string("{\"a\":nan}"),
                                    std::string("{\"a\":-inf}"),
                                    std::string("{\"a\":.5}"),
                                    std::string("{\"a\":+1}"),
                                    std::string("{\"a\":1e999}"),
                                    std::string("{\"a\":0x10}"),
                                    std::string("{\"a\":\"x}"),
                                    std::string("{\"a\":\"\\u0041\"}"),
                                    std::string("{\"a\":\"\n\"}"),
                                    std::string(60000, '['),
                                    std::string("{\"a\":") + std::string(60000, '{'),
                                    many + "}"}) {
        EXPECT_FALSE(readJsonObject(text)) << text.substr(0, 40);
    }
}

TEST(PageRules, textsAreEscaped) {
    EXPECT_EQ(htmlText("<script>alert(\"1\")</script> & 'x'"),
              "&lt;script&gt;alert(&quot;1&quot;)&lt;/script&gt; &amp; &#39;x&#39;");
    EXPECT_EQ(jsonText("a\"b\\c\n\x01 \xC3\xA4"), "\"a\\\"b\\\\c\\u000a\\u0001 \xC3\xA4\"");
}

TEST(PageRules, valuesInQueries) {
    EXPECT_EQ(queryValue("page=abc&after=12", "page"), "abc");
    EXPECT_EQ(queryValue("page=abc&after=12", "after"), "12");
    EXPECT_EQ(queryValue("page=abc&after=12", "aft"), "");
    EXPECT_EQ(queryValue("mypage=abc", "page"), "");
    EXPECT_EQ(queryValue("page=", "page"), "");
    EXPECT_EQ(queryValue("&&page=1", "page"), "1");
    EXPECT_EQ(queryValue("", "page"), "");
}

} // namespace
} // namespace qivo::test

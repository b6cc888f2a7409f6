#include "common/password.h"
#include "common/text.h"
#include "support.h"

#include <climits>
#include <cstring>

using namespace bakjob;

TEST(Text, PathsAreEscapedOnce)
{
    EXPECT_EQ(escape_path("My Photos (2013)"), "My\\ Photos\\ \\(2013\\)");
    EXPECT_EQ(escape_path("a=b;c"), "a\\=b\\;c");
    EXPECT_EQ(escape_path("it's 100%"), "it\\'s\\ 100\\%");
    EXPECT_EQ(escape_path("$`#^&+{}[]"), "\\$\\`\\#\\^\\&\\+\\{\\}\\[\\]");
    EXPECT_EQ(escape_path("/a\"b\\c!d*e?f<g>h|i~j\tk"), "/a\"b\\c!d*e?f<g>h|i~j\tk");

    char plain[PATH_SIZE] = "/srv/share1";
    EXPECT_EQ(fix_path_special_char(plain), nullptr);
    EXPECT_STREQ(plain, "/srv/share1");
    char blank[PATH_SIZE] = "a b";
    EXPECT_EQ(fix_path_special_char(blank), blank);
    EXPECT_STREQ(blank, "a\\ b");
}

TEST(Text, AnEscapedPathNeverLeavesItsBuffer)
{
    for (const std::size_t length : {511U, 512U, 1022U, 1023U}) {
        for (const char *start : {"", "x"}) {
            char text[PATH_SIZE + 1] = "";
            std::memset(text + std::strlen(start), '$', length - std::strlen(start));
            std::memcpy(text, start, std::strlen(start));
            text[PATH_SIZE] = 'G';
            fix_path_special_char(text);
            EXPECT_EQ(text[PATH_SIZE], 'G');
            ASSERT_LT(std::strlen(text), PATH_SIZE);
            EXPECT_EQ(std::string(text).back(), '$') << "half an escape at the end";
        }
    }
}

TEST(Text, TrimsBlanksAndControlCharactersAtTheEndOnly)
{
    const std::map<std::string, std::string> cases{
        {"a b \r\n", "a b"}, {" \t\v\f\x01\x7f", ""}, {"a\tb", "a\tb"}, {"", ""}, {"caf\xe9", "caf\xe9"}};
    for (const auto &[text, trimmed] : cases) {
        std::string copy = text;
        trim_right(copy);
        EXPECT_EQ(copy, trimmed);
        char buffer[32] = "";
        ASSERT_TRUE(copy_text(buffer, text));
        trim_right(buffer);
        EXPECT_EQ(buffer, trimmed);
    }
}

TEST(Text, ANumberIsTheWholeText)
{
    for (const char *none : {"", " 1", "1 ", "+1", "1x", "-", "2147483648", "1.5"}) {
        EXPECT_FALSE(whole_number<int>(none)) << none;
    }
    EXPECT_EQ(whole_number<int>("-2147483648"), INT_MIN);
    EXPECT_EQ(whole_number("10", 3, 10), 10);
    EXPECT_FALSE(whole_number("11", 3, 10) || whole_number("2", 3, 10));
}

TEST(Password, FitsItsFieldUpTo93Characters)
{
    char encoded[PASSWORD_SIZE] = "";
    EXPECT_EQ(password_encode(encoded, "pakto", sizeof encoded), 8);
    EXPECT_STREQ(encoded, "cGFrdG8=");
    EXPECT_EQ(password_encode(encoded, std::string(93, 'x').c_str(), sizeof encoded), 124);
    char decoded[PASSWORD_SIZE] = "";
    EXPECT_EQ(password_decode(decoded, encoded, sizeof decoded), 93);
    EXPECT_EQ(decoded, std::string(93, 'x'));
    EXPECT_EQ(password_encode(encoded, std::string(94, 'x').c_str(), sizeof encoded), -1);
    EXPECT_EQ(password_decode(decoded, "not base64!", sizeof decoded), -1);
}

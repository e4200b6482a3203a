// The word reader under both parsers: words, comments, the rest of a line,
// numbers, and the wording of complaints.
#include <gtest/gtest.h>

#include "TokenCursor.h"

TEST(TokenCursorWords, SplitAtBlanksUpToAComment) {
    TokenCursor cursor("  expect\tcall  Mvd_Open(\"a b\", 1)   # why");
    EXPECT_EQ("expect", cursor.next());
    EXPECT_EQ("call", cursor.peek());
    EXPECT_EQ("call", cursor.next());
    EXPECT_EQ("Mvd_Open(\"a b\", 1)", cursor.rest());
    EXPECT_TRUE(cursor.atEnd());
    EXPECT_EQ("", cursor.next());
    EXPECT_EQ("", cursor.rest());
    EXPECT_TRUE(TokenCursor("   # only a comment").atEnd());
    EXPECT_EQ("a#b c", TokenCursor("x a#b c").restAfterFirst());
}

TEST(TokenCursorWords, ComplaintsQuoteWhatWasFound) {
    TokenCursor cursor("start bogus");
    cursor.next();
    EXPECT_EQ("expected stream=N but found 'bogus'", cursor.expected("stream=N"));
    cursor.next();
    EXPECT_EQ("expected stream=N but found end of line", cursor.expected("stream=N"));
    EXPECT_EQ("expected X but found 'a?b'", TokenCursor::expected("X", std::string("a\x01" "b")));
    EXPECT_EQ("expected X but found '" + std::string(40, 'z') + "...'", TokenCursor::expected("X", std::string(50, 'z')));
}

TEST(TokenCursorNumbers, DecimalHexSignAndRange) {
    const std::pair<const char*, int64_t> good[] = {{"42", 42}, {"0x1F", 31}, {"-0x10", -16}, {"100", 100}};
    for (const auto& g : good) {
        int64_t v = 0;
        EXPECT_TRUE(TokenCursor::parseInteger(g.first, -100, 100, &v)) << g.first;
        EXPECT_EQ(g.second, v) << g.first;
    }
    int64_t v = 0;  // the widest range a step uses
    EXPECT_TRUE(TokenCursor::parseInteger("4294967295", 0, 0xFFFFFFFFll, &v));
    EXPECT_EQ(4294967295ll, v);
    for (const char* bad : {"", "-", "0x", "1.5", "12a", " 1", "0x-1", "101", "-101", "99999999999999999999999"}) {
        v = 7;
        EXPECT_FALSE(TokenCursor::parseInteger(bad, -100, 100, &v)) << bad;
        EXPECT_EQ(7, v) << bad;
    }
}

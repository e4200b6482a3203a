// Walks the words of one line of a step or scenario text and words the
// parsers' complaints the same way everywhere: "expected X but found Y".
// Nothing here throws; every read reports failure through its result.
#ifndef QUELLBORN_TOOLS_TOKENCURSOR_H
#define QUELLBORN_TOOLS_TOKENCURSOR_H

#include <cstdint>
#include <string>
#include <vector>

class TokenCursor {
public:
    // Splits `line` at blanks and tabs; a '#' that starts a word starts a
    // comment, which runs to the end of the line.
    explicit TokenCursor(const std::string& line);

    bool atEnd() const { return mNext >= mWords.size(); }
    // The next word without taking it ("" at the end).
    const std::string& peek() const;
    std::string next();
    // Everything from the next word to the end of the line, as written
    // (inner blanks kept, comment removed), and consumes it.
    std::string rest();
    // rest() after skipping the first word.
    std::string restAfterFirst() {
        next();
        return rest();
    }

    // "expected <what> but found '<next word>'" or "... but found end of line".
    std::string expected(const std::string& what) const;
    // The same complaint about a word already taken.
    static std::string expected(const std::string& what, const std::string& found);

    // Decimal or 0x-prefixed hexadecimal, optionally negative, within
    // [min, max]; false for anything else (no partial reads).
    static bool parseInteger(const std::string& text, int64_t min, int64_t max, int64_t* out);

private:
    struct Word {
        std::string text;
        size_t offset;
    };
    std::string mLine;
    std::vector<Word> mWords;
    size_t mNext = 0;
    size_t mEnd = 0;  // where the comment (or the line) ends
};

#endif  // QUELLBORN_TOOLS_TOKENCURSOR_H

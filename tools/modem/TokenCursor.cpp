#include "TokenCursor.h"

#include <cctype>

namespace {

bool isBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

// A found word is quoted; a long one is cut so one bad token cannot flood
// the message.
std::string shown(const std::string& word) {
    constexpr size_t kShown = 40;
    std::string out;
    for (char c : word.substr(0, kShown)) {
        out += std::isprint(static_cast<unsigned char>(c)) ? c : '?';
    }
    return "'" + out + (word.size() > kShown ? "...'" : "'");
}

}  // namespace

TokenCursor::TokenCursor(const std::string& line) : mLine(line), mEnd(line.size()) {
    size_t i = 0;
    while (i < line.size()) {
        while (i < line.size() && isBlank(line[i])) ++i;
        if (i >= line.size()) break;
        if (line[i] == '#') {
            mEnd = i;
            break;
        }
        const size_t start = i;
        while (i < line.size() && !isBlank(line[i])) ++i;
        mWords.push_back(Word{line.substr(start, i - start), start});
    }
}

const std::string& TokenCursor::peek() const {
    static const std::string kNone;
    return atEnd() ? kNone : mWords[mNext].text;
}

std::string TokenCursor::next() {
    if (atEnd()) return "";
    return mWords[mNext++].text;
}

std::string TokenCursor::rest() {
    if (atEnd()) return "";
    size_t end = mEnd;
    while (end > mWords[mNext].offset && isBlank(mLine[end - 1])) --end;
    const std::string out = mLine.substr(mWords[mNext].offset, end - mWords[mNext].offset);
    mNext = mWords.size();
    return out;
}

std::string TokenCursor::expected(const std::string& what) const {
    if (atEnd()) return "expected " + what + " but found end of line";
    return expected(what, peek());
}

std::string TokenCursor::expected(const std::string& what, const std::string& found) {
    return "expected " + what + " but found " + (found.empty() ? "nothing" : shown(found));
}

bool TokenCursor::parseInteger(const std::string& text, int64_t min, int64_t max, int64_t* out) {
    size_t i = 0;
    const bool negative = !text.empty() && text[0] == '-';
    if (negative) ++i;
    int base = 10;
    if (text.size() > i + 1 && text[i] == '0' && (text[i + 1] == 'x' || text[i + 1] == 'X')) {
        base = 16;
        i += 2;
    }
    if (i >= text.size()) return false;
    // Accumulated as unsigned with an explicit bound, so no input overflows.
    constexpr uint64_t kLimit = uint64_t(1) << 40;
    uint64_t value = 0;
    for (; i < text.size(); ++i) {
        const unsigned char c = static_cast<unsigned char>(text[i]);
        int digit;
        if (std::isdigit(c)) {
            digit = c - '0';
        } else if (base == 16 && std::isxdigit(c)) {
            digit = std::tolower(c) - 'a' + 10;
        } else {
            return false;
        }
        value = value * static_cast<uint64_t>(base) + static_cast<uint64_t>(digit);
        if (value > kLimit) return false;
    }
    const int64_t signedValue = negative ? -static_cast<int64_t>(value) : static_cast<int64_t>(value);
    if (signedValue < min || signedValue > max) return false;
    *out = signedValue;
    return true;
}

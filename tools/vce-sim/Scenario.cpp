#include "Scenario.h"

#include <climits>
#include <sstream>

#include "TokenCursor.h"
#include "VtspRecord.h"

namespace {

using Actor = ScenarioStep::Actor;

// How the words after a verb are read.
enum class Args { kNone, kInts, kText, kView, kInitFlag, kIntThenText, kBind };

struct VerbSpec {
    const char* verb;
    const char* usage;  // shown after the verb in complaints
    Args args;
    size_t minInts;
    size_t maxInts;
};

const VerbSpec kClientVerbs[] = {
        {"callback", "", Args::kNone, 0, 0},
        {"callback-reentrant", "CODE", Args::kInts, 1, 1},
        {"clean-callback", "", Args::kNone, 0, 0},
        {"init", "[loopback]", Args::kInitFlag, 0, 0},
        {"surface", "remote|local", Args::kView, 0, 0},
        {"clean-surface", "remote|local", Args::kView, 0, 0},
        {"camera", "ID", Args::kInts, 1, 1},
        {"size", "N", Args::kInts, 1, 1},
        {"orientation", "DEVICE SCREEN AUTOROTATE", Args::kInts, 3, 3},
        {"qos", "KBPS", Args::kInts, 1, 1},
        {"hide", "IMAGE-PATH", Args::kText, 0, 0},
        {"show", "", Args::kNone, 0, 0},
        {"release", "", Args::kNone, 0, 0},
        {"die", "", Args::kNone, 0, 0},
        {"send", "CODE [INT ...]", Args::kInts, 1, 16},
};

const VerbSpec kMediaVerbs[] = {
        {"rtp-first", "", Args::kNone, 0, 0},
        {"rtp-break", "", Args::kNone, 0, 0},
        {"rtp-received", "", Args::kNone, 0, 0},
        {"codec-changed", "VALUE1 VALUE2", Args::kInts, 2, 2},
        {"capture-size", "WIDTH HEIGHT", Args::kInts, 2, 2},
        {"event", "N [WORD1 ...]", Args::kInts, 1, 16},
        {"remote-size", "WIDTH HEIGHT", Args::kInts, 2, 2},
        {"zmf", "EVENT JSON", Args::kIntThenText, 1, 1},
};

const VerbSpec kLinkVerbs[] = {
        {"stop", "", Args::kNone, 0, 0},
        {"start", "", Args::kNone, 0, 0},
        {"restart", "", Args::kNone, 0, 0},
        {"stall", "MILLISECONDS", Args::kInts, 1, 1},
};

const VerbSpec kExpectVerbs[] = {
        {"call", "TEXT", Args::kText, 0, 0},
        {"no-call", "TEXT", Args::kText, 0, 0},
        {"reply", "N", Args::kInts, 1, 1},
        {"event", "N [VALUE1 VALUE2 VALUE3]", Args::kInts, 1, 4},
        {"no-event", "N", Args::kInts, 1, 1},
        {"bind", "stream=N [local=IP:PORT]", Args::kBind, 0, 0},
        {"log", "TEXT", Args::kText, 0, 0},
        {"dump", "TEXT", Args::kText, 0, 0},
};

const VerbSpec kWait = {"wait", "MILLISECONDS", Args::kInts, 1, 1};

template <size_t N>
std::string verbList(const VerbSpec (&specs)[N]) {
    std::string out;
    for (size_t i = 0; i < N; ++i) out += (i ? ", " : "") + std::string(specs[i].verb);
    return out;
}

template <size_t N>
const VerbSpec* findVerb(const VerbSpec (&specs)[N], const std::string& verb) {
    for (const VerbSpec& spec : specs) {
        if (verb == spec.verb) return &spec;
    }
    return nullptr;
}

std::string what(const VerbSpec& spec) { return std::string(spec.verb) + " " + spec.usage; }

bool readInts(TokenCursor& cursor, const VerbSpec& spec, ScenarioStep* step, std::string* error) {
    while (!cursor.atEnd() && step->ints.size() < spec.maxInts) {
        int64_t value;
        if (!TokenCursor::parseInteger(cursor.peek(), INT32_MIN, INT32_MAX, &value)) break;
        step->ints.push_back(static_cast<int32_t>(value));
        cursor.next();
    }
    if (step->ints.size() < spec.minInts || !cursor.atEnd()) {
        *error = cursor.expected(what(spec));
        return false;
    }
    return true;
}

bool readView(TokenCursor& cursor, const VerbSpec& spec, ScenarioStep* step, std::string* error) {
    const std::string view = cursor.peek();
    if (view != "remote" && view != "local") {
        *error = cursor.expected(what(spec));
        return false;
    }
    step->ints.push_back(view == "remote" ? 0 : 1);
    step->text = view;
    cursor.next();
    if (!cursor.atEnd()) *error = cursor.expected("end of line after " + view);
    return cursor.atEnd();
}

bool readInitFlag(TokenCursor& cursor, ScenarioStep* step, std::string* error) {
    const bool loopback = cursor.peek() == "loopback";
    if (loopback) cursor.next();
    step->ints.push_back(loopback ? 1 : 0);
    if (!cursor.atEnd()) *error = cursor.expected("init or init loopback");
    return cursor.atEnd();
}

bool readBind(TokenCursor& cursor, const VerbSpec& spec, ScenarioStep* step, std::string* error) {
    const std::string streamWord = cursor.peek();
    int64_t stream;
    if (streamWord.compare(0, 7, "stream=") != 0 ||
        !TokenCursor::parseInteger(streamWord.substr(7), 0, 0xFFFFFFFFll, &stream)) {
        *error = cursor.expected(what(spec));
        return false;
    }
    step->modem.stream.streamId = static_cast<uint32_t>(stream);
    cursor.next();
    if (!cursor.atEnd()) {
        const std::string localWord = cursor.peek();
        if (localWord.compare(0, 6, "local=") != 0 ||
            !vtspcodec::parseEndpoint(localWord.substr(6), &step->modem.stream.localAddr)) {
            *error = cursor.expected("local=IP:PORT");
            return false;
        }
        step->hasLocal = true;
        cursor.next();
    }
    if (!cursor.atEnd()) *error = cursor.expected("end of line after the bind");
    return cursor.atEnd();
}

bool readArgs(TokenCursor& cursor, const VerbSpec& spec, ScenarioStep* step, std::string* error) {
    switch (spec.args) {
        case Args::kNone:
            if (!cursor.atEnd()) *error = cursor.expected("end of line after " + std::string(spec.verb));
            return cursor.atEnd();
        case Args::kInts:
            if (!readInts(cursor, spec, step, error)) return false;
            if (std::string(spec.verb) == "event" && step->actor == Actor::kExpect && step->ints.size() != 1 &&
                step->ints.size() != 4) {
                *error = TokenCursor::expected(what(spec), "only " + std::to_string(step->ints.size() - 1) +
                                                                   " values");
                return false;
            }
            return true;
        case Args::kText:
            step->text = cursor.rest();
            if (step->text.empty()) *error = cursor.expected(what(spec));
            return !step->text.empty();
        case Args::kView:
            return readView(cursor, spec, step, error);
        case Args::kInitFlag:
            return readInitFlag(cursor, step, error);
        case Args::kIntThenText: {
            int64_t value;
            if (!TokenCursor::parseInteger(cursor.peek(), INT32_MIN, INT32_MAX, &value)) {
                *error = cursor.expected(what(spec));
                return false;
            }
            cursor.next();
            step->ints.push_back(static_cast<int32_t>(value));
            step->text = cursor.rest();
            if (step->text.empty()) *error = cursor.expected(what(spec));
            return !step->text.empty();
        }
        case Args::kBind:
            return readBind(cursor, spec, step, error);
    }
    return false;
}

template <size_t N>
bool readVerb(TokenCursor& cursor, const VerbSpec (&specs)[N], const char* kind, ScenarioStep* step,
              std::string* error) {
    const VerbSpec* spec = findVerb(specs, cursor.peek());
    if (spec == nullptr) {
        *error = cursor.expected(std::string("a ") + kind + " (" + verbList(specs) + ")");
        return false;
    }
    step->verb = cursor.next();
    return readArgs(cursor, *spec, step, error);
}

bool parseLine(TokenCursor& cursor, ScenarioStep* step, std::string* error) {
    const std::string actor = cursor.peek();
    if (actor == "client") {
        step->actor = Actor::kClient;
        cursor.next();
        return readVerb(cursor, kClientVerbs, "client action", step, error);
    }
    if (actor == "media") {
        step->actor = Actor::kMedia;
        cursor.next();
        return readVerb(cursor, kMediaVerbs, "media event", step, error);
    }
    if (actor == "link") {
        step->actor = Actor::kLink;
        cursor.next();
        if (!readVerb(cursor, kLinkVerbs, "link action", step, error)) return false;
        if (step->verb == "stall" && (step->ints[0] < 0 || step->ints[0] > 60000)) {
            *error = TokenCursor::expected("stall 0..60000 (milliseconds)", std::to_string(step->ints[0]));
            return false;
        }
        return true;
    }
    if (actor == "expect") {
        step->actor = Actor::kExpect;
        cursor.next();
        return readVerb(cursor, kExpectVerbs, "expectation", step, error);
    }
    if (actor == "modem") {
        step->actor = Actor::kModem;
        step->verb = cursor.next();
        return StepSyntax::parse(cursor, &step->modem, error);
    }
    if (actor == "dump") {
        // What `adb shell dumpsys VideoCallEngineService ARGS` prints.
        step->actor = Actor::kDump;
        step->verb = cursor.next();
        step->text = cursor.rest();
        return true;
    }
    if (actor == "wait") {
        step->actor = Actor::kWait;
        step->verb = cursor.next();
        if (!readInts(cursor, kWait, step, error)) return false;
        if (step->ints[0] < 0 || step->ints[0] > 60000) {
            *error = TokenCursor::expected("wait 0..60000 (milliseconds)", std::to_string(step->ints[0]));
            return false;
        }
        return true;
    }
    *error = cursor.expected("client, modem, media, link, wait, dump, expect or a ## heading");
    return false;
}

// "## text" lines are headings: shown in the timeline, not comments.
bool headingOf(const std::string& line, std::string* text) {
    const size_t start = line.find_first_not_of(" \t");
    if (start == std::string::npos || line.compare(start, 2, "##") != 0) return false;
    const size_t body = line.find_first_not_of(" \t#", start);
    *text = body == std::string::npos ? "" : line.substr(body);
    while (!text->empty() && (text->back() == '\r' || text->back() == ' ')) text->pop_back();
    return true;
}

}  // namespace

bool Scenario::parse(const std::string& text, Scenario* out, std::string* error) {
    std::istringstream in(text);
    std::string line;
    std::vector<ScenarioStep> steps;
    for (int number = 1; std::getline(in, line); ++number) {
        ScenarioStep step;
        step.line = number;
        if (headingOf(line, &step.text)) {
            steps.push_back(step);
            continue;
        }
        TokenCursor cursor(line);
        if (cursor.atEnd()) continue;
        step.source = TokenCursor(line).rest();
        if (!parseLine(cursor, &step, error)) {
            *error = "line " + std::to_string(number) + ": " + *error;
            return false;
        }
        steps.push_back(step);
    }
    out->mSteps = std::move(steps);
    return true;
}

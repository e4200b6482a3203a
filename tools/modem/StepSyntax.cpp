#include "StepSyntax.h"

#include <cstring>
#include <set>
#include <sstream>

using namespace android;
using vtspcodec::ConfigCommand;
using vtspcodec::StreamCommand;

namespace {

using Step = StepSyntax::Step;
using Kind = StepSyntax::Kind;

constexpr const char* kOrientationUri = "urn:3gpp:video-orientation";
constexpr int64_t kU32Max = 0xFFFFFFFFll;

struct Field {
    const char* key;
    const char* expects;  // completes "expected <key>=<expects>"
    bool (*apply)(const std::string& value, Step* step);
};

bool u32(const std::string& text, uint32_t* out) {
    int64_t v;
    if (!TokenCursor::parseInteger(text, 0, kU32Max, &v)) return false;
    *out = static_cast<uint32_t>(v);
    return true;
}

bool u16(const std::string& text, uint16_t* out) {
    int64_t v;
    if (!TokenCursor::parseInteger(text, 0, 0xFFFF, &v)) return false;
    *out = static_cast<uint16_t>(v);
    return true;
}

bool s16(const std::string& text, int64_t min, int64_t max, int16_t* out) {
    int64_t v;
    if (!TokenCursor::parseInteger(text, min, max, &v)) return false;
    *out = static_cast<int16_t>(static_cast<uint16_t>(v));
    return true;
}

// Splits "A:B" at the first colon.
bool splitPair(const std::string& text, std::string* a, std::string* b) {
    const size_t colon = text.find(':');
    if (colon == std::string::npos) return false;
    *a = text.substr(0, colon);
    *b = text.substr(colon + 1);
    return true;
}

bool direction(const std::string& text, uint32_t* out) {
    for (uint32_t d = 0; vtspcodec::directionName(d) != nullptr; ++d) {
        if (text == vtspcodec::directionName(d)) {
            *out = d;
            return true;
        }
    }
    int64_t v;
    if (!TokenCursor::parseInteger(text, 0, kU32Max, &v)) return false;
    *out = static_cast<uint32_t>(v);
    return true;
}

bool payloadTypes(const std::string& text, Step* s) {
    const size_t comma = text.find(',');
    if (comma == std::string::npos) return u32(text, &s->stream.encodeType[0]);
    return u32(text.substr(0, comma), &s->stream.encodeType[0]) &&
           u32(text.substr(comma + 1), &s->stream.encodeType[1]);
}

bool extension(const std::string& text, Step* s) {
    std::string id = text, uri = kOrientationUri;
    if (text.find(':') != std::string::npos) splitPair(text, &id, &uri);
    if (uri.size() > kExtmapUriSize || !u32(id, &s->stream.extmapId)) return false;
    s->stream.extmapUri = uri;
    return true;
}

bool controlPorts(const std::string& text, Step* s) {
    std::string local, remote;
    return splitPair(text, &local, &remote) && u16(local, &s->stream.localControlPort) &&
           u16(remote, &s->stream.remoteControlPort);
}

const Field kStreamFields[] = {
        {"stream", "N (0..4294967295)", [](const std::string& v, Step* s) { return u32(v, &s->stream.streamId); }},
        {"dir", "ended|inactive|sendonly|recvonly|sendrecv or a number",
         [](const std::string& v, Step* s) { return direction(v, &s->stream.dir); }},
        {"local", "IP:PORT", [](const std::string& v, Step* s) { return vtspcodec::parseEndpoint(v, &s->stream.localAddr); }},
        {"remote", "IP:PORT", [](const std::string& v, Step* s) { return vtspcodec::parseEndpoint(v, &s->stream.remoteAddr); }},
        {"pt", "N or N,N", payloadTypes},
        {"encoder", "N", [](const std::string& v, Step* s) { return u32(v, &s->stream.encoder); }},
        {"bw", "KBPS", [](const std::string& v, Step* s) { return u32(v, &s->stream.localVideoAsBwKbps); }},
        {"rbw", "KBPS", [](const std::string& v, Step* s) { return u32(v, &s->stream.remoteVideoAsBwKbps); }},
        {"ext", "ID or ID:URI (URI up to 128 characters)", extension},
        {"rtcp-ports", "LOCAL:REMOTE", controlPorts},
        {"type", "N", [](const std::string& v, Step* s) { return u32(v, &s->type); }},
};

const Field kConfigFields[] = {
        {"stream", "N (-32768..32767)",
         [](const std::string& v, Step* s) { return s16(v, -32768, 32767, &s->config.data[1]); }},
        {"rtcp", "MASK (0..0xffff)",
         [](const std::string& v, Step* s) { return s16(v, -32768, 0xFFFF, &s->config.data[2]); }},
        {"on", "N (-32768..32767)",
         [](const std::string& v, Step* s) { return s16(v, -32768, 32767, &s->config.data[0]); }},
        {"templ", "N", [](const std::string& v, Step* s) { return u32(v, &s->config.templCode); }},
        {"type", "N", [](const std::string& v, Step* s) { return u32(v, &s->type); }},
};

const Field kRawFields[] = {
        {"target", "N", [](const std::string& v, Step* s) { return u32(v, &s->targetModule); }},
        {"type", "N", [](const std::string& v, Step* s) { return u32(v, &s->type); }},
        {"code", "N", [](const std::string& v, Step* s) {
             int64_t code;
             if (!TokenCursor::parseInteger(v, INT32_MIN, INT32_MAX, &code)) return false;
             s->rawCode = static_cast<int32_t>(code);
             return true;
         }},
};

struct KindInfo {
    const char* word;
    Kind kind;
    const Field* fields;
    size_t fieldCount;
    const char* required[2];  // keys that must be present (null: none)
};

template <size_t N>
constexpr size_t count(const Field (&)[N]) { return N; }

const KindInfo kKinds[] = {
        {"start", Kind::kStart, kStreamFields, count(kStreamFields), {"stream", nullptr}},
        {"modify", Kind::kModify, kStreamFields, count(kStreamFields), {"stream", nullptr}},
        {"end", Kind::kEnd, kStreamFields, count(kStreamFields), {"stream", nullptr}},
        {"config", Kind::kConfig, kConfigFields, count(kConfigFields), {"stream", "rtcp"}},
        {"raw", Kind::kRaw, kRawFields, count(kRawFields), {"target", nullptr}},
};

const KindInfo* kindInfo(Kind kind) {
    for (const KindInfo& info : kKinds) {
        if (info.kind == kind) return &info;
    }
    return nullptr;
}

int32_t codeOf(Kind kind) {
    switch (kind) {
        case Kind::kModify: return _VTSP_CMD_STREAM_VIDEO_MODITY;
        case Kind::kEnd: return _VTSP_CMD_STREAM_VIDEO_END;
        default: return _VTSP_CMD_STREAM_VIDEO_START;
    }
}

std::string keyList(const KindInfo& info) {
    std::string out;
    for (size_t i = 0; i < info.fieldCount; ++i) out += std::string(i ? ", " : "") + info.fields[i].key + "=";
    return out;
}

const Field* findField(const KindInfo& info, const std::string& key) {
    for (size_t i = 0; i < info.fieldCount; ++i) {
        if (key == info.fields[i].key) return &info.fields[i];
    }
    return nullptr;
}

bool parseFields(TokenCursor& cursor, const KindInfo& info, Step* step, std::string* error) {
    std::set<std::string> seen;
    while (!cursor.atEnd()) {
        const std::string word = cursor.peek();
        const size_t eq = word.find('=');
        const std::string key = word.substr(0, eq);
        const Field* field = eq == std::string::npos ? nullptr : findField(info, key);
        if (field == nullptr) {
            *error = cursor.expected(std::string("a field of ") + info.word + " (" + keyList(info) + ")");
            return false;
        }
        if (!seen.insert(key).second) {
            *error = cursor.expected(key + "= only once");
            return false;
        }
        if (!field->apply(word.substr(eq + 1), step)) {
            *error = cursor.expected(key + "=" + field->expects);
            return false;
        }
        cursor.next();
    }
    for (const char* key : info.required) {
        if (key != nullptr && seen.count(key) == 0) {
            *error = cursor.expected(std::string(key) + "=" + findField(info, key)->expects);
            return false;
        }
    }
    return true;
}

bool hasAddress(const OSAL_NetAddress& a) { return vtspcodec::addressText(a) != "-"; }

std::string streamText(const Step& step) {
    const StreamCommand& c = step.stream;
    std::ostringstream out;
    out << " stream=" << c.streamId;
    const char* dir = vtspcodec::directionName(c.dir);
    if (step.kind != Kind::kEnd || c.dir != VTSP_STREAM_DIR_SENDRECV) {
        out << " dir=" << (dir != nullptr ? std::string(dir) : std::to_string(c.dir));
    }
    if (hasAddress(c.localAddr)) out << " local=" << vtspcodec::endpointText(c.localAddr);
    if (hasAddress(c.remoteAddr)) out << " remote=" << vtspcodec::endpointText(c.remoteAddr);
    if (c.encodeType[0] != 96 || c.encodeType[1] != 0) {
        out << " pt=" << c.encodeType[0];
        if (c.encodeType[1] != 0) out << "," << c.encodeType[1];
    }
    if (c.encoder != 0) out << " encoder=" << c.encoder;
    if (c.localVideoAsBwKbps != 0) out << " bw=" << c.localVideoAsBwKbps;
    if (c.remoteVideoAsBwKbps != 0) out << " rbw=" << c.remoteVideoAsBwKbps;
    if (c.extmapId != 0 || !c.extmapUri.empty()) {
        out << " ext=" << c.extmapId;
        if (c.extmapUri != kOrientationUri) out << ":" << c.extmapUri;
    }
    if (c.localControlPort != 0 || c.remoteControlPort != 0) {
        out << " rtcp-ports=" << c.localControlPort << ":" << c.remoteControlPort;
    }
    return out.str();
}

std::string configText(const Step& step) {
    const ConfigCommand& c = step.config;
    char mask[16];
    snprintf(mask, sizeof(mask), "0x%x", unsigned(static_cast<uint16_t>(c.data[2])));
    std::string out = " stream=" + std::to_string(c.data[1]) + " rtcp=" + mask;
    if (c.data[0] != 1) out += " on=" + std::to_string(c.data[0]);
    if (c.templCode != TEMPL_RTCP_FB) out += " templ=" + std::to_string(c.templCode);
    return out;
}

}  // namespace

VPR_Comm StepSyntax::Step::record() const {
    switch (kind) {
        case Kind::kConfig:
            return vtspcodec::configRecord(config, type, VPMD_VIDEO_CMDEVT_TARGET);
        case Kind::kRaw:
            return vtspcodec::commandRecord(rawCode, type, targetModule);
        default: {
            StreamCommand cmd = stream;
            cmd.code = codeOf(kind);
            return vtspcodec::streamRecord(cmd, type, VPMD_VIDEO_CMDEVT_TARGET);
        }
    }
}

bool StepSyntax::parse(TokenCursor& cursor, Step* out, std::string* error) {
    const KindInfo* info = nullptr;
    for (const KindInfo& k : kKinds) {
        if (cursor.peek() == k.word) info = &k;
    }
    if (info == nullptr) {
        *error = cursor.expected("a step (start, modify, end, config, raw)");
        return false;
    }
    cursor.next();
    Step step;
    step.kind = info->kind;
    step.stream.code = codeOf(info->kind);
    if (!parseFields(cursor, *info, &step, error)) return false;
    *out = step;
    return true;
}

bool StepSyntax::parse(const std::string& text, Step* out, std::string* error) {
    TokenCursor cursor(text);
    return parse(cursor, out, error);
}

bool StepSyntax::parseLines(std::istream& in, std::vector<Step>* out, std::string* error) {
    std::string line;
    for (int number = 1; std::getline(in, line); ++number) {
        TokenCursor cursor(line);
        if (cursor.atEnd()) continue;
        Step step;
        if (!parse(cursor, &step, error)) {
            *error = "line " + std::to_string(number) + ": " + *error;
            return false;
        }
        out->push_back(step);
    }
    return true;
}

StepSyntax::Step StepSyntax::fromRecord(const VPR_Comm& record) {
    Step step;
    const vtspcodec::Trailer trailer = vtspcodec::trailerOf(record);
    step.type = trailer.type;
    step.targetModule = trailer.targetModule;
    step.rawCode = vtspcodec::codeOf(record);
    if (step.targetModule != VPMD_VIDEO_CMDEVT_TARGET) {
        step.kind = Kind::kRaw;
        return step;
    }
    switch (step.rawCode) {
        case _VTSP_CMD_STREAM_VIDEO_START: step.kind = Kind::kStart; break;
        case _VTSP_CMD_STREAM_VIDEO_MODITY: step.kind = Kind::kModify; break;
        case _VTSP_CMD_STREAM_VIDEO_END: step.kind = Kind::kEnd; break;
        case _VTSP_CMD_CONFIG: step.kind = Kind::kConfig; break;
        default: step.kind = Kind::kRaw; return step;
    }
    if (step.kind == Kind::kConfig) {
        step.config = vtspcodec::readConfigCommand(record);
    } else {
        step.stream = vtspcodec::readStreamCommand(record);
    }
    return step;
}

std::string StepSyntax::format(const Step& step) {
    const std::string word = kindInfo(step.kind)->word;
    std::string text;
    switch (step.kind) {
        case Kind::kConfig:
            text = word + configText(step);
            break;
        case Kind::kRaw:
            return word + " target=" + std::to_string(step.targetModule) + " type=" + std::to_string(step.type) +
                   " code=" + std::to_string(step.rawCode);
        default:
            text = word + streamText(step);
            break;
    }
    if (step.type != 0) text += " type=" + std::to_string(step.type);
    return text;
}

bool StepSyntax::exact(const VPR_Comm& record) {
    Step step;
    std::string error;
    if (!parse(format(fromRecord(record)), &step, &error)) return false;
    const VPR_Comm rebuilt = step.record();
    return memcmp(&rebuilt, &record, sizeof(record)) == 0;
}

const char* StepSyntax::usage() {
    return "  start|modify|end stream=N [dir=ended|inactive|sendonly|recvonly|sendrecv|0..4]\n"
           "                   [local=IP:PORT] [remote=IP:PORT] [pt=N[,N]] [encoder=N] [bw=KBPS]\n"
           "                   [rbw=KBPS] [ext=ID[:URI]] [rtcp-ports=LOCAL:REMOTE] [type=N]\n"
           "  config stream=N rtcp=MASK [on=N] [templ=N] [type=N]\n"
           "  raw target=N [type=N] [code=N]\n"
           "  IPv6: [ADDR]:PORT. Numbers: decimal or 0x hex. ext=ID alone is urn:3gpp:video-orientation.\n";
}

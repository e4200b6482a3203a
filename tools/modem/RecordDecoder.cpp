#include "RecordDecoder.h"

#include <algorithm>
#include <cstring>
#include <sstream>

#include "StepSyntax.h"
#include "VtspRecord.h"

using namespace android;

namespace {

constexpr size_t kExcerpt = 16;

// Text taken from a record may hold any byte; a terminal gets '?' instead.
std::string printable(std::string text) {
    for (char& c : text) {
        if (static_cast<unsigned char>(c) < 0x20 || static_cast<unsigned char>(c) >= 0x7f) c = '?';
    }
    return text;
}

std::string endpoint(const OSAL_NetAddress& a) {
    const std::string text = vtspcodec::endpointText(a);
    return text == "-" ? "no address (type " + std::to_string(a.type) + ")" : text;
}

std::string familyText(uint32_t type) {
    if (type == kAddrTypeIpv4 || type == kAddrTypeIpv4Alt) return "IPv4";
    if (type == kAddrTypeIpv6 || type == kAddrTypeIpv6Alt) return "IPv6";
    return "none";
}

std::string dirText(uint32_t dir) {
    const char* name = vtspcodec::directionName(dir);
    return name != nullptr ? name : "dir " + std::to_string(dir) + " (unknown)";
}

std::string targetText(uint32_t target) {
    switch (target) {
        case VPMD_VIDEO_CMDEVT_TARGET: return "0 (video command)";
        case VPMD_NET_TARGET: return "1 (network)";
        case VPMD_VPAD_TARGET: return "8 (liveness)";
        default: return std::to_string(target) + " (unknown)";
    }
}

std::string streamSummary(const VPR_Comm& record) {
    const vtspcodec::StreamCommand c = StepSyntax::fromRecord(record).stream;
    std::ostringstream out;
    out << vtspcodec::commandName(c.code) << " stream " << c.streamId;
    if (c.code == _VTSP_CMD_STREAM_VIDEO_END) return out.str();
    out << " " << dirText(c.dir) << " " << endpoint(c.localAddr) << " <-> " << endpoint(c.remoteAddr) << " pt "
        << c.encodeType[0];
    if (c.localVideoAsBwKbps != 0) out << " bw " << c.localVideoAsBwKbps;
    return out.str();
}

std::string commandSummary(const VPR_Comm& record) {
    const int32_t code = vtspcodec::codeOf(record);
    std::string text;
    if (code == _VTSP_CMD_CONFIG) {
        const vtspcodec::ConfigCommand c = vtspcodec::readConfigCommand(record);
        text = "CONFIG stream " + std::to_string(c.data[1]) + " rtcp " + RecordDecoder::rtcpMaskText(c.data[2]) +
               (c.data[0] == 1 ? "" : " off");
    } else if (vtspcodec::commandName(code) != nullptr) {
        text = streamSummary(record);
    } else {
        text = "code " + std::to_string(code) + " (unknown command)";
    }
    const uint32_t type = vtspcodec::trailerOf(record).type;
    if (type != 0) text += " [type " + std::to_string(type) + ": dropped]";
    return text;
}

void describeStream(const VPR_Comm& record, std::vector<std::string>* lines) {
    const vtspcodec::StreamCommand c = StepSyntax::fromRecord(record).stream;
    auto add = [lines](const std::string& line) { lines->push_back("  " + line); };
    add("stream " + std::to_string(c.streamId) + "  dir " + std::to_string(c.dir) + " " + dirText(c.dir) +
        "  encoder " + std::to_string(c.encoder));
    add("payload types " + std::to_string(c.encodeType[0]) + ", " + std::to_string(c.encodeType[1]));
    add("local  " + endpoint(c.localAddr) + "  rtcp " + std::to_string(c.localControlPort) + "  type " +
        std::to_string(c.localAddr.type) + " (" + familyText(c.localAddr.type) + ")");
    add("remote " + endpoint(c.remoteAddr) + "  rtcp " + std::to_string(c.remoteControlPort) + "  type " +
        std::to_string(c.remoteAddr.type) + " (" + familyText(c.remoteAddr.type) + ")");
    add("bandwidth local " + std::to_string(c.localVideoAsBwKbps) + " kbps, remote " +
        std::to_string(c.remoteVideoAsBwKbps) + " kbps");
    add("extension " + std::to_string(c.extension) + "  extmap id " + std::to_string(c.extmapId) + " uri \"" +
        printable(c.extmapUri) + "\"");
    add("confMask " + std::to_string(c.confMask) + "  rdnDynType " + std::to_string(c.rdnDynType));
}

void describeCommand(const VPR_Comm& record, std::vector<std::string>* lines) {
    const int32_t code = vtspcodec::codeOf(record);
    const vtspcodec::ConfigCommand c = vtspcodec::readConfigCommand(record);
    const char* name = vtspcodec::commandName(code);
    lines->push_back("  " + std::string(name != nullptr ? name : "unknown command") + " (code " +
                     std::to_string(code) + ")  infc " + std::to_string(c.infc));
    const uint32_t type = vtspcodec::trailerOf(record).type;
    if (type != 0) {
        lines->push_back("  type " + std::to_string(type) + ": the link drops video commands whose type is not 0");
    }
    if (code == _VTSP_CMD_CONFIG) {
        lines->push_back("  template " + std::to_string(c.templCode) +
                         (c.templCode == TEMPL_RTCP_FB ? " (RTCP feedback)" : " (unknown)") + "  on " +
                         std::to_string(c.data[0]) + "  stream " + std::to_string(c.data[1]) + "  mask " +
                         RecordDecoder::rtcpMaskText(c.data[2]));
    } else if (name != nullptr) {
        describeStream(record, lines);
    } else {
        lines->push_back("  body: " + RecordDecoder::hexExcerpt(record.body, kExcerpt) + " ...");
    }
}

void describeBody(const VPR_Comm& record, std::vector<std::string>* lines) {
    switch (vtspcodec::trailerOf(record).targetModule) {
        case VPMD_VIDEO_CMDEVT_TARGET:
            describeCommand(record, lines);
            break;
        case VPMD_NET_TARGET: {
            const vtspcodec::BindRequest bind = vtspcodec::readBindRequest(record);
            lines->push_back("  " + std::string(bind.code == VPR_NET_CMD_BIND ? "BIND" : "unknown network request") +
                             " (code " + std::to_string(bind.code) + ")  stream " + std::to_string(bind.streamId) +
                             "  address " + endpoint(bind.addr) + "  type " + std::to_string(bind.addr.type) + " (" +
                             familyText(bind.addr.type) + ")");
            break;
        }
        case VPMD_VPAD_TARGET:
            lines->push_back("  modem liveness notice (the link logs \"modem is active\" and drops it)");
            break;
        default:
            lines->push_back("  unknown target module: the link drops it; body: " +
                             RecordDecoder::hexExcerpt(record.body, kExcerpt) + " ...");
            break;
    }
}

}  // namespace

std::string RecordDecoder::summary(const VPR_Comm& record) {
    const vtspcodec::Trailer trailer = vtspcodec::trailerOf(record);
    switch (trailer.targetModule) {
        case VPMD_VIDEO_CMDEVT_TARGET:
            return commandSummary(record);
        case VPMD_NET_TARGET: {
            const vtspcodec::BindRequest bind = vtspcodec::readBindRequest(record);
            if (bind.code != VPR_NET_CMD_BIND) return "NET code " + std::to_string(bind.code) + " (unknown)";
            return "BIND stream " + std::to_string(bind.streamId) + " " + endpoint(bind.addr);
        }
        case VPMD_VPAD_TARGET:
            return "LIVENESS (modem is active)";
        default:
            return "target " + std::to_string(trailer.targetModule) + " (unknown) body " +
                   hexExcerpt(record.body, 8);
    }
}

std::vector<std::string> RecordDecoder::describe(const VPR_Comm& record, size_t index) {
    std::vector<std::string> lines;
    const vtspcodec::Trailer trailer = vtspcodec::trailerOf(record);
    std::string header = "record " + std::to_string(index) + "  type " + std::to_string(trailer.type) +
                         "  targetModule " + targetText(trailer.targetModule) + "  recordLength " +
                         std::to_string(trailer.recordLength);
    if (trailer.recordLength != kVprCommSize) {
        header += " (not 3664: if the trailer looks like body bytes, the capture is off a record boundary)";
    }
    lines.push_back(header);
    describeBody(record, &lines);
    if (trailer.targetModule != VPMD_NET_TARGET) {
        lines.push_back(std::string("  step") + (StepSyntax::exact(record) ? ": " : " (approximate): ") +
                        printable(StepSyntax::format(StepSyntax::fromRecord(record))));
    }
    return lines;
}

RecordDecoder::StreamResult RecordDecoder::decodeStream(std::istream& in, std::ostream& out, bool stepsOnly) {
    StreamResult result;
    VPR_Comm record;
    for (;;) {
        in.read(reinterpret_cast<char*>(&record), sizeof(record));
        const size_t got = static_cast<size_t>(in.gcount());
        if (got < sizeof(record)) {
            result.trailingBytes = got;
            break;
        }
        if (stepsOnly) {
            out << printable(StepSyntax::format(StepSyntax::fromRecord(record))) << "\n";
        } else {
            for (const std::string& line : describe(record, result.records)) out << line << "\n";
        }
        ++result.records;
    }
    if (result.trailingBytes != 0) {
        // Steps output stays pipeable into `vtsp encode`: the report is a comment there.
        out << (stepsOnly ? "# " : "") << "trailing " << result.trailingBytes << " bytes after " << result.records
            << " whole records (" << result.records * kVprCommSize + result.trailingBytes
            << " bytes is not a multiple of 3664): "
            << hexExcerpt(reinterpret_cast<const uint8_t*>(&record), std::min(result.trailingBytes, kExcerpt))
            << (result.trailingBytes > kExcerpt ? " ..." : "") << "\n";
    }
    return result;
}

std::string RecordDecoder::hexExcerpt(const uint8_t* bytes, size_t count) {
    std::string out;
    char hex[4];
    for (size_t i = 0; i < count; ++i) {
        snprintf(hex, sizeof(hex), "%02x", bytes[i]);
        out += (i ? " " : "") + std::string(hex);
    }
    return out;
}

std::string RecordDecoder::rtcpMaskText(int16_t mask) {
    const unsigned bits = static_cast<uint16_t>(mask);
    char text[16];
    snprintf(text, sizeof(text), "0x%x", bits);
    std::string names;
    if (bits & 0x10) names += " NACK";
    if (bits & 0x40) names += " FIR";
    if (bits & 0x80) names += " TMMBR";
    if (bits & ~0xD0u) names += " +ignored";
    return names.empty() ? text : std::string(text) + " (" + names.substr(1) + ")";
}

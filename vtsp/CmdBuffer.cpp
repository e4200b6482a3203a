#include "CmdBuffer.h"

#include <android/log.h>
#include <log/log_main.h>

#include <cstdio>
#include <cstring>

namespace android {

namespace {

constexpr const char* kTag = "cmdbuffer";
constexpr size_t kDumpSize = 1024;

// A default-constructed buffer holds no body; giving it a type that no
// operation acts on keeps translate, compose and print from touching it.
constexpr VPR_CommType kNoBody = static_cast<VPR_CommType>(0xFFFFFFFFu);

// Each stream start turns two addresses into text; writing the digits
// directly costs a fraction of formatting them one by one with snprintf.
char* putDecimal(char* p, unsigned value) {
    if (value >= 100) *p++ = static_cast<char>('0' + value / 100);
    if (value >= 10) *p++ = static_cast<char>('0' + value / 10 % 10);
    *p++ = static_cast<char>('0' + value % 10);
    return p;
}

char* putHex(char* p, unsigned value) {
    static const char kDigits[] = "0123456789abcdef";
    bool started = false;
    for (int shift = 12; shift >= 0; shift -= 4) {
        const unsigned digit = (value >> shift) & 0xfu;
        started = started || digit != 0 || shift == 0;
        if (started) *p++ = kDigits[digit];
    }
    return p;
}

uint32_t littleEndianIpv4(const uint8_t (&octets)[4]) {
    return uint32_t(octets[0]) | uint32_t(octets[1]) << 8 | uint32_t(octets[2]) << 16 |
           uint32_t(octets[3]) << 24;
}

}  // namespace

std::atomic<int32_t> CmdBuffer::con{0};
std::atomic<int32_t> CmdBuffer::des{0};

CmdBuffer::CmdBuffer() : type(kNoBody), length(0), cmd{} {
    ++con;
}

CmdBuffer::CmdBuffer(VPR_CommType type_, const unsigned char* bytes)
        : type(type_), length(bodyLengthOf(type_)) {
    if (bytes == nullptr) length = 0;
    // Every command passes through here: copy the body and zero only the
    // rest, rather than zeroing the whole area first.
    if (length > 0) memcpy(cmd, bytes, length);
    memset(cmd + length, 0, sizeof(cmd) - length);
    ++con;
}

std::shared_ptr<CmdBuffer> CmdBuffer::fromRecord(const VPR_Comm& record) {
    return std::shared_ptr<CmdBuffer>(new CmdBuffer(VPR_COMM_VTSP_CMD, record.body));
}

CmdBuffer::CmdBuffer(const CmdBuffer& other) : type(other.type), length(other.length), cmd{} {
    memcpy(cmd, other.cmd, length);
    ++con;
}

CmdBuffer& CmdBuffer::operator=(const CmdBuffer& other) {
    if (this != &other) {
        type = other.type;
        length = other.length;
        memcpy(cmd, other.cmd, length);
    }
    ++con;
    return *this;
}

CmdBuffer::~CmdBuffer() {
    const int32_t destroyed = ++des;
    __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s: %d/%d", "~CmdBuffer", destroyed, con.load());
}

void CmdBuffer::translate(bool toHost) {
    if (toHost && type == VPR_COMM_VTSP_CMD) {
        VtspStmVideoView& v = command().u.stmVideo;
        swapAddress(v.localAddr);
        swap16(v.localControlPort);
        swapAddress(v.remoteAddr);
        swap16(v.remoteControlPort);
    } else if (!toHost && type == VPR_COMM_NET) {
        swapAddress(reinterpret_cast<VprNetBind*>(cmd)->addr);
    }
}

void CmdBuffer::compose(VPR_Comm* out) const {
    memcpy(out->body, cmd, length);
    if (type == VPR_COMM_NET) out->targetModule = VPMD_NET_TARGET;
    out->recordLength = kVprCommSize;
}

void CmdBuffer::print() const {
    if (type != VPR_COMM_VTSP_CMD) return;
    const VtspCommand& c = command();
    if (c.code < kFirstPrintedCode) return;
    // Building the dump is the costliest step of handling a command; skip it
    // when the handset's log level would drop the line anyway.
    if (!__android_log_is_loggable(ANDROID_LOG_INFO, kTag, ANDROID_LOG_VERBOSE)) return;

    const VtspArgView& a = c.u.arg;
    const VtspStmVideoView& v = c.u.stmVideo;
    const OSAL_NetAddress& r = v.remoteAddr;
    const OSAL_NetAddress& l = v.localAddr;
    char uri[kExtmapUriSize + 1];
    copyExtmapUri(v, uri);

    char text[kDumpSize] = {};
    snprintf(text, sizeof(text),
             "VTSP Command: type %d, length %d  code: %d, infc: %d \n"
             " arg0~6: %d %d %d %d %d %d %d\n"
             " stmVideo: streamId %d dir %d encoder %d confMask 0x%x rdnDynType %d\n"
             "           remoteAddr<ipv4 0x%x ipv6 0x%04x %04x %04x %04x %04x %04x %04x %04x, port %d, type: %d>\n"
             "           remoteControlPort %d\n"
             "           localAddr<ipv4 0x%x ipv6 0x%04x %04x %04x %04x %04x %04x %04x %04x, port %d, type: %d>\n"
             "           localControlPort %d\n"
             "           localVideoAsBwKbps %d Kbps\n"
             "           remoteVideoAsBwKbps %d Kbps\n"
             "           encodeType[0] %d, encodeType[1] %d\n"
             "           rtp extension: extension %d, extmapId %d, extmapUri %s\n",
             int(type), int(length), c.code, int(c.infc),
             a.arg0, a.arg1, a.arg2, a.arg3, a.arg4, a.arg5, int(a.arg6),
             int(v.streamId), int(v.dir), int(v.encoder), unsigned(v.confMask), int(v.rdnDynType),
             unsigned(littleEndianIpv4(r.ipv4)), unsigned(r.ipv6[0]), unsigned(r.ipv6[1]),
             unsigned(r.ipv6[2]), unsigned(r.ipv6[3]), unsigned(r.ipv6[4]), unsigned(r.ipv6[5]),
             unsigned(r.ipv6[6]), unsigned(r.ipv6[7]), int(r.port), int(r.type),
             int(v.remoteControlPort),
             unsigned(littleEndianIpv4(l.ipv4)), unsigned(l.ipv6[0]), unsigned(l.ipv6[1]),
             unsigned(l.ipv6[2]), unsigned(l.ipv6[3]), unsigned(l.ipv6[4]), unsigned(l.ipv6[5]),
             unsigned(l.ipv6[6]), unsigned(l.ipv6[7]), int(l.port), int(l.type),
             int(v.localControlPort),
             int(v.localVideoAsBwKbps), int(v.remoteVideoAsBwKbps),
             int(v.encodeType[0]), int(v.encodeType[1]),
             int(v.extension), int(v.extmapId), uri);
    // The text is complete: hand it over as it is instead of formatting it a second time.
    __android_log_write(ANDROID_LOG_INFO, kTag, text);
}

void ConvertIpToString(char* out, const void* addr, bool ipv4) {
    char* p = out;
    if (ipv4) {
        const uint8_t* octets = static_cast<const uint8_t*>(addr);
        for (int i = 0; i < 4; ++i) {
            p = putDecimal(p, octets[i]);
            *p++ = '.';
        }
    } else {
        uint16_t groups[8];
        memcpy(groups, addr, sizeof(groups));
        for (uint16_t group : groups) {
            p = putHex(p, group);
            *p++ = ':';
        }
    }
    p[-1] = '\0';  // the trailing separator
}

}  // namespace android

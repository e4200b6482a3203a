// Wire layouts of the records exchanged with the modem over its pipe.
//
// Every multi-byte field is little-endian (the handset's order) except the
// ports and IPv6 groups named in docs/vtsp-record.md, which travel big-endian.
// The structs use fixed-width types only, so the layouts hold on the 32-bit
// device and on a 64-bit host alike; the static_asserts below pin every size
// and offset the modem relies on.
#ifndef QUELLBORN_VTSP_VPRCOMM_H
#define QUELLBORN_VTSP_VPRCOMM_H

#include <cstddef>
#include <cstdint>

namespace android {

// Sizes of the record and of the bodies it can carry.
constexpr size_t kVprCommSize = 3664;
constexpr size_t kVprCommBodySize = 3652;
constexpr size_t kVtspCommandSize = 444;
constexpr size_t kVprType1Size = 236;
constexpr size_t kVprNetBindSize = 2580;
constexpr size_t kCmdBufferCapacity = kVprNetBindSize;
constexpr size_t kExtmapUriSize = 128;

// Values of VPR_Comm::targetModule.
enum VprTargetModule : uint32_t {
    VPMD_VIDEO_CMDEVT_TARGET = 0,
    VPMD_NET_TARGET = 1,
    VPMD_VPAD_TARGET = 8,
};

// Kind of body a CmdBuffer holds (kept in the buffer, never read from a record).
enum VPR_CommType : uint32_t {
    VPR_COMM_VTSP_CMD = 0,
    VPR_COMM_TYPE1 = 1,
    VPR_COMM_NET = 5,
};

// VTSP command codes.
enum VtspCommandCode : int32_t {
    _VTSP_CMD_CONFIG = 15,
    _VTSP_CMD_STREAM_VIDEO_START = 81,
    _VTSP_CMD_STREAM_VIDEO_MODITY = 82,
    _VTSP_CMD_STREAM_VIDEO_END = 88,
};

// The dump prints only commands from this code upwards, so configuration
// commands stay out of the log while every stream command is shown.
constexpr int32_t kFirstPrintedCode = 79;

// Stream directions carried in stmVideo.dir.
enum VtspStreamDir : uint32_t {
    _VTSP_STREAM_DIR_ENDED = 0,
    _VTSP_STREAM_DIR_INACTIVE = 1,
    VTSP_STREAM_DIR_SENDONLY = 2,
    VTSP_STREAM_DIR_RECVONLY = 3,
    VTSP_STREAM_DIR_SENDRECV = 4,
};

// Configuration template of the RTCP feedback mask.
constexpr uint32_t TEMPL_RTCP_FB = 23;

// Code of a network bind request body.
constexpr uint32_t VPR_NET_CMD_BIND = 7;

// Values of OSAL_NetAddress::type.
constexpr uint32_t kAddrTypeIpv4 = 0;
constexpr uint32_t kAddrTypeIpv4Alt = 1;
constexpr uint32_t kAddrTypeIpv6 = 2;
constexpr uint32_t kAddrTypeIpv6Alt = 3;

struct OSAL_NetAddress {
    uint8_t ipv4[4];      // network order, first octet first; never swapped
    uint16_t ipv6[8];     // big-endian on the wire
    uint16_t port;        // big-endian on the wire
    uint8_t reserved[2];
    uint32_t type;        // 0/1 IPv4, 2/3 IPv6, anything else: no address
};

struct VtspArgView {
    int32_t arg0;
    int32_t arg1;
    int32_t arg2;
    int32_t arg3;
    int32_t arg4;
    int32_t arg5;
    uint8_t arg6;
};

struct VtspConfigView {
    uint32_t templCode;
    int16_t data[3];      // data[0] switch, data[1] stream id, data[2] value
};

struct VtspStmVideoView {
    uint32_t streamId;
    uint32_t dir;
    uint8_t reserved0[4];
    uint32_t encoder;
    uint8_t reserved1[32];
    uint32_t encodeType[2];
    uint8_t reserved2[8];
    uint32_t extension;
    uint32_t extmapId;
    char extmapUri[kExtmapUriSize];   // not always terminated: see copyExtmapUri
    uint32_t confMask;
    uint8_t rdnDynType;
    uint8_t reserved3[3];
    OSAL_NetAddress remoteAddr;
    uint16_t remoteControlPort;       // big-endian on the wire
    uint8_t reserved4[2];
    OSAL_NetAddress localAddr;
    uint16_t localControlPort;        // big-endian on the wire
    uint8_t reserved5[2];
    uint32_t localVideoAsBwKbps;
    uint32_t remoteVideoAsBwKbps;
};

// Body of a VPR_COMM_VTSP_CMD record. From offset 8 the same bytes are read
// through three views; each reader names the view it uses.
struct VtspCommand {
    int32_t code;
    uint16_t infc;
    uint8_t reserved[2];
    union {
        VtspArgView arg;
        VtspConfigView config;
        VtspStmVideoView stmVideo;
        uint8_t raw[kVtspCommandSize - 8];
    } u;
};

// Body of a VPR_COMM_NET record: tells the modem the local end of a stream.
struct VprNetBind {
    uint32_t code;
    int32_t streamId;
    OSAL_NetAddress addr;
    uint8_t reserved[kVprNetBindSize - 36];
};

// The record on the pipe.
struct VPR_Comm {
    uint8_t body[kVprCommBodySize];
    uint32_t type;
    uint32_t targetModule;
    uint32_t recordLength;
};

static_assert(sizeof(OSAL_NetAddress) == 28, "OSAL_NetAddress is 28 bytes");
static_assert(offsetof(OSAL_NetAddress, ipv4) == 0, "ipv4 offset");
static_assert(offsetof(OSAL_NetAddress, ipv6) == 4, "ipv6 offset");
static_assert(offsetof(OSAL_NetAddress, port) == 20, "port offset");
static_assert(offsetof(OSAL_NetAddress, type) == 24, "type offset");

static_assert(sizeof(VtspCommand) == kVtspCommandSize, "VtspCommand is 444 bytes");
static_assert(offsetof(VtspCommand, code) == 0, "code offset");
static_assert(offsetof(VtspCommand, infc) == 4, "infc offset");
static_assert(offsetof(VtspCommand, u) == 8, "views start at 8");

static_assert(offsetof(VtspCommand, u.arg.arg0) == 8, "arg0 offset");
static_assert(offsetof(VtspCommand, u.arg.arg1) == 12, "arg1 offset");
static_assert(offsetof(VtspCommand, u.arg.arg2) == 16, "arg2 offset");
static_assert(offsetof(VtspCommand, u.arg.arg3) == 20, "arg3 offset");
static_assert(offsetof(VtspCommand, u.arg.arg4) == 24, "arg4 offset");
static_assert(offsetof(VtspCommand, u.arg.arg5) == 28, "arg5 offset");
static_assert(offsetof(VtspCommand, u.arg.arg6) == 32, "arg6 offset");

static_assert(offsetof(VtspCommand, u.config.templCode) == 8, "templCode offset");
static_assert(offsetof(VtspCommand, u.config.data) == 12, "data offset");
static_assert(sizeof(VtspConfigView::data) == 6, "data[0..2] are 16-bit");

static_assert(offsetof(VtspCommand, u.stmVideo.streamId) == 8, "streamId offset");
static_assert(offsetof(VtspCommand, u.stmVideo.dir) == 12, "dir offset");
static_assert(offsetof(VtspCommand, u.stmVideo.encoder) == 20, "encoder offset");
static_assert(offsetof(VtspCommand, u.stmVideo.encodeType) == 56, "encodeType offset");
static_assert(offsetof(VtspCommand, u.stmVideo.extension) == 72, "extension offset");
static_assert(offsetof(VtspCommand, u.stmVideo.extmapId) == 76, "extmapId offset");
static_assert(offsetof(VtspCommand, u.stmVideo.extmapUri) == 80, "extmapUri offset");
static_assert(offsetof(VtspCommand, u.stmVideo.confMask) == 208, "confMask offset");
static_assert(offsetof(VtspCommand, u.stmVideo.rdnDynType) == 212, "rdnDynType offset");
static_assert(offsetof(VtspCommand, u.stmVideo.remoteAddr) == 216, "remoteAddr offset");
static_assert(offsetof(VtspCommand, u.stmVideo.remoteControlPort) == 244, "remoteControlPort offset");
static_assert(offsetof(VtspCommand, u.stmVideo.localAddr) == 248, "localAddr offset");
static_assert(offsetof(VtspCommand, u.stmVideo.localControlPort) == 276, "localControlPort offset");
static_assert(offsetof(VtspCommand, u.stmVideo.localVideoAsBwKbps) == 280, "localVideoAsBwKbps offset");
static_assert(offsetof(VtspCommand, u.stmVideo.remoteVideoAsBwKbps) == 284, "remoteVideoAsBwKbps offset");
static_assert(sizeof(VtspStmVideoView) + 8 + 156 == kVtspCommandSize, "156 trailing bytes");

static_assert(sizeof(VprNetBind) == kVprNetBindSize, "VprNetBind is 2580 bytes");
static_assert(offsetof(VprNetBind, code) == 0, "bind code offset");
static_assert(offsetof(VprNetBind, streamId) == 4, "bind stream id offset");
static_assert(offsetof(VprNetBind, addr) == 8, "bind address offset");

static_assert(sizeof(VPR_Comm) == kVprCommSize, "VPR_Comm is 3664 bytes");
static_assert(offsetof(VPR_Comm, body) == 0, "body offset");
static_assert(offsetof(VPR_Comm, type) == 3652, "type offset");
static_assert(offsetof(VPR_Comm, targetModule) == 3656, "targetModule offset");
static_assert(offsetof(VPR_Comm, recordLength) == 3660, "recordLength offset");
static_assert(kCmdBufferCapacity <= kVprCommBodySize, "every body fits the record");

// Nothing in a record is wider than 32 bits, so the 32-bit device and a
// 64-bit host align every record and view alike.
static_assert(alignof(OSAL_NetAddress) == 4 && alignof(VtspCommand) == 4 && alignof(VprNetBind) == 4 &&
              alignof(VPR_Comm) == 4, "records are 32-bit aligned on every ABI");
static_assert(sizeof(VtspArgView) == 28, "VtspArgView is 28 bytes");
static_assert(sizeof(VtspConfigView) == 12, "VtspConfigView is 12 bytes");
static_assert(sizeof(VtspStmVideoView) == 280, "VtspStmVideoView is 280 bytes");
static_assert(sizeof(VprTargetModule) == 4 && sizeof(VPR_CommType) == 4 && sizeof(VtspCommandCode) == 4 &&
              sizeof(VtspStreamDir) == 4, "the enums travel as 32-bit words");

// Body length of each VPR_CommType; 0 for a type the system does not know.
constexpr uint32_t bodyLengthOf(VPR_CommType type) {
    return type == VPR_COMM_VTSP_CMD ? kVtspCommandSize
         : type == VPR_COMM_TYPE1    ? kVprType1Size
         : type == VPR_COMM_NET      ? kVprNetBindSize
                                     : 0;
}

// Copies the extension URI into a terminated text. The modem may fill all 128
// bytes without a terminator; the text is then exactly those 128 characters,
// and nothing past the field is ever read.
void copyExtmapUri(const VtspStmVideoView& view, char (&out)[kExtmapUriSize + 1]);

// Swaps a 16-bit field between wire (big-endian) and host order.
inline void swap16(uint16_t& v) { v = static_cast<uint16_t>((v >> 8) | (v << 8)); }

// Swaps the port and the eight IPv6 groups of an address.
void swapAddress(OSAL_NetAddress& addr);

}  // namespace android

#endif  // QUELLBORN_VTSP_VPRCOMM_H

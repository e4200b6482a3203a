#include "ChaosGenerator.h"

namespace {

// A handful of stream ids, so that starts, changes and ends meet the same
// streams often; 7 is never started on purpose by most runs.
const char* const kStreams[] = {"1", "2", "3", "7"};
const char* const kDirections[] = {"ended", "inactive", "sendonly", "recvonly", "sendrecv", "sendrecv", "sendrecv", "9"};
const char* const kLocals[] = {"10.0.0.1:6000", "10.0.0.1:6000", "10.0.0.2:6010", "[fe80::1]:6002",
                               "none", "10.0.0.1:0"};
const char* const kRemotes[] = {"192.168.1.2:5000", "192.168.1.2:5000", "192.168.1.2:5002", "[2001:db8::2]:5004",
                                "none"};
const char* const kPayloads[] = {"96", "97", "96,97", "0"};
const char* const kBandwidths[] = {"0", "500", "2000", "5000", "4194304"};
const char* const kMasks[] = {"0x10", "0x40", "0x80", "0xd0", "0x0", "0xffff"};
const char* const kOrientations[] = {"0", "90", "180", "270", "-90", "2147483647"};
const char* const kQos[] = {"0", "100", "480", "896", "2000", "-1"};
const char* const kZmfEvents[] = {
        "27 {\"RenderId\":\"Remote\",\"SourceType\":0,\"Width\":480,\"Height\":640,\"Window\":1}",
        "28 {\"RenderId\":\"Remote\",\"SourceType\":0,\"Width\":640,\"Height\":480,\"Window\":1}",
        "21 {\"CaptureId\":\"Camera 1, Facing front, Orientation 270\",\"Width\":640,\"Height\":480,\"FrameRate\":30}",
        "27 {\"RenderId\":\"Remote\"",
        "28 not json at all",
};

}  // namespace

std::string ChaosGenerator::next(Actor actor) {
    if (actor == Actor::kAny) {
        const int roll = pick(100);
        // The platform's dumpsys may come at any time too.
        if (roll >= 97) return std::string("dump") + oneOf({"", " --link", " --streams", " --engine --history", " -a"});
        actor = roll < 40 ? Actor::kModem : roll < 73 ? Actor::kClient : roll < 93 ? Actor::kMedia : Actor::kLink;
    }
    switch (actor) {
        case Actor::kClient: return client();
        case Actor::kModem: return modem();
        case Actor::kMedia: return media();
        default: return link();
    }
}

std::string ChaosGenerator::client() {
    const int roll = pick(100);
    if (roll < 8) return "client callback";
    if (roll < 14) return std::string("client callback-reentrant ") + oneOf({"2", "3", "8"});
    if (roll < 18) return "client clean-callback";
    if (roll < 24) return chance(25) ? "client init loopback" : "client init";
    if (roll < 32) return std::string("client surface ") + oneOf({"remote", "local"});
    if (roll < 37) return std::string("client clean-surface ") + oneOf({"remote", "local"});
    if (roll < 47) return std::string("client camera ") + oneOf({"-1", "0", "1", "1", "5"});
    if (roll < 53) return "client size " + std::to_string(pick(14) - 1);
    if (roll < 58) {
        return std::string("client orientation ") + oneOf(kOrientations) + " " + std::to_string(pick(5)) + " " +
               std::to_string(pick(2));
    }
    if (roll < 62) return std::string("client qos ") + oneOf(kQos);
    if (roll < 66) return "client hide /data/vce/hold.png";
    if (roll < 70) return "client show";
    if (roll < 80) return "client release";
    if (roll < 84) return "client die";
    // Any code, with too few, enough or too many fields.
    std::string line = "client send " + std::to_string(pick(22) - 1);
    for (int i = pick(4); i > 0; --i) line += " " + std::to_string(pick(3) - 1);
    return line;
}

std::string ChaosGenerator::streamFields() {
    std::string fields = std::string("stream=") + oneOf(kStreams) + " dir=" + oneOf(kDirections);
    fields += std::string(" local=") + oneOf(kLocals) + " remote=" + oneOf(kRemotes);
    fields += std::string(" pt=") + oneOf(kPayloads) + " bw=" + oneOf(kBandwidths);
    if (chance(20)) fields += " encoder=1";
    if (chance(40)) fields += chance(80) ? " ext=3" : " ext=4:urn:3gpp:other";
    if (chance(30)) fields += " rtcp-ports=6001:5001";
    return fields;
}

std::string ChaosGenerator::modem() {
    const int roll = pick(100);
    std::string line;
    if (roll < 35) {
        line = "modem start " + streamFields();
    } else if (roll < 65) {
        line = "modem modify " + streamFields();
    } else if (roll < 78) {
        line = std::string("modem end stream=") + oneOf(kStreams);
    } else if (roll < 92) {
        line = std::string("modem config stream=") + oneOf(kStreams) + " rtcp=" + oneOf(kMasks) +
               (chance(20) ? " on=0" : "");
    } else {
        return std::string("modem raw target=") + oneOf({"0", "1", "5", "8"}) + " code=" + oneOf({"42", "81", "15"});
    }
    if (chance(3)) line += " type=1";
    return line;
}

std::string ChaosGenerator::media() {
    const int roll = pick(100);
    if (roll < 10) return "media rtp-first";
    if (roll < 35) return "media rtp-break";
    if (roll < 55) return "media rtp-received";
    if (roll < 62) return "media codec-changed " + std::to_string(pick(128)) + " " + std::to_string(pick(3));
    if (roll < 69) return "media capture-size 320 240";
    if (roll < 82) return "media remote-size " + std::to_string(pick(1000)) + " " + std::to_string(pick(1000));
    if (roll < 88) return "media event " + std::to_string(pick(40) - 1) + " 1 2 3";
    return std::string("media zmf ") + oneOf(kZmfEvents);
}

std::string ChaosGenerator::link() {
    const int roll = pick(100);
    if (roll < 30) return "link stop";
    if (roll < 60) return "link start";
    if (roll < 80) return "link stall " + std::to_string(50 + pick(300));
    return "link restart";
}

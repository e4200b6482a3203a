// Recording stand-in for the media engine as a whole: version texts and
// provisioning values that tests set.
#include <map>
#include <string>

#include "CallRecorder.h"
#include "Mme.h"

namespace hostfakes {
namespace {

// A text the engine may have or not (null).
struct Text {
    bool present = false;
    std::string value;
    const char* get() const { return present ? value.c_str() : nullptr; }
    void set(const char* text) {
        present = text != nullptr;
        value = present ? text : "";
    }
};

struct MmeState {
    Text melonVersion;
    Text mmeVersion;
    std::map<std::string, int> values;
    std::map<std::string, Text> strings;
    std::map<std::pair<std::string, int>, Text> mapStrings;
    MmeState() {
        melonVersion.set("melon-1.0");
        mmeVersion.set("mme-1.0");
    }
};

MmeState& state() {
    static MmeState* s = [] {
        auto* fresh = new MmeState();
        CallRecorder::instance().addResetHook([fresh] {
            std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
            *fresh = MmeState();
        });
        return fresh;
    }();
    return *s;
}

// Texts handed to the system must stay valid after the call: they live in
// the state until the next reset or change of that value.
const char* lookup(const Text& text) { return text.get(); }

int value(const char* key) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    if (key == nullptr) return 0;
    const auto it = state().values.find(key);
    return it == state().values.end() ? 0 : it->second;
}

}  // namespace

void setVersions(const char* melonVersion, const char* mmeVersion) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().melonVersion.set(melonVersion);
    state().mmeVersion.set(mmeVersion);
}

void setProvValue(const std::string& key, int v) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().values[key] = v;
}

void setProvString(const std::string& key, const char* text) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().strings[key].set(text);
}

void setProvMapString(const std::string& key, int index, const char* text) {
    std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
    state().mapStrings[{key, index}].set(text);
}

}  // namespace hostfakes

using namespace hostfakes;

extern "C" {

int Mme_Start(void) { return recordCall("Mme_Start", {}); }
int Mme_Stop(void) { return recordCall("Mme_Stop", {}); }
int Mme_CfgSetDumpDebug(int bEnable) { return recordCall("Mme_CfgSetDumpDebug", {argText(bEnable)}); }
int Mme_CfgSetPrintDebug(int bEnable) { return recordCall("Mme_CfgSetPrintDebug", {argText(bEnable)}); }
int Mme_CfgSetCfgDir(const char* pcDir) { return recordCall("Mme_CfgSetCfgDir", {argText(pcDir)}); }
int Mme_CfgSetLogDir(const char* pcDir) { return recordCall("Mme_CfgSetLogDir", {argText(pcDir)}); }
int Mme_CfgSetLogLevel(unsigned int iLevel) { return recordCall("Mme_CfgSetLogLevel", {argText(iLevel)}); }
int Mme_CfgSetLogLevelX(unsigned int iLevel) { return recordCall("Mme_CfgSetLogLevelX", {argText(iLevel)}); }

const char* Mme_GetVer(void) {
    const char* text = nullptr;
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        text = lookup(state().mmeVersion);
    }
    recordCall("Mme_GetVer", {"-> " + argText(text)});
    return text;
}

const char* Melon_GetVersion(void) {
    const char* text = nullptr;
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        text = lookup(state().melonVersion);
    }
    recordCall("Melon_GetVersion", {"-> " + argText(text)});
    return text;
}

int Mme_ProvGetValueBool(const char* pcKey) {
    return recordCall("Mme_ProvGetValueBool", {argText(pcKey)}, value(pcKey));
}

int Mme_ProvGetValueInt(const char* pcKey) {
    return recordCall("Mme_ProvGetValueInt", {argText(pcKey)}, value(pcKey));
}

int Mme_ProvGetValueEnum(const char* pcKey) {
    return recordCall("Mme_ProvGetValueEnum", {argText(pcKey)}, value(pcKey));
}

const char* Mme_ProvGetValueStr(const char* pcKey) {
    const char* text = nullptr;
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        if (pcKey != nullptr) {
            const auto it = state().strings.find(pcKey);
            if (it != state().strings.end()) text = lookup(it->second);
        }
    }
    recordCall("Mme_ProvGetValueStr", {argText(pcKey), "-> " + argText(text)});
    return text;
}

const char* Mme_ProvGetMapStr(const char* pcKey, int iIndex) {
    const char* text = nullptr;
    {
        std::lock_guard<std::mutex> lock(CallRecorder::instance().stateMutex());
        if (pcKey != nullptr) {
            const auto it = state().mapStrings.find({pcKey, iIndex});
            if (it != state().mapStrings.end()) text = lookup(it->second);
        }
    }
    recordCall("Mme_ProvGetMapStr", {argText(pcKey), argText(iIndex), "-> " + argText(text)});
    return text;
}

}  // extern "C"

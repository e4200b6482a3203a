// The library loaded by a real JVM: what the load hook logs and registers,
// the service that VceService.init brings up, the Mme natives under their
// exact signatures, the exported symbols, and the hook's failure paths when
// the application lacks one of its classes.
#include <android/log.h>
#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "HostFakes.h"
#include "JvmHarness.h"
#include "MmeJni.h"
#include "VceServiceJni.h"

using namespace jvmtest;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;

namespace {

constexpr const char* kJniTag = "VCEService-JNI";
constexpr const char* kRegistrationTag = "Mme-JNI";
constexpr const char* kMmeRegistered = "RegisterNatives, kClassName com/tessaroval/vce/Mme";

class LoadHookTest : public JvmCase {
protected:
    std::vector<std::string> linesOf(const char* tag) const {
        std::vector<std::string> out;
        for (const LogLine& line : log.linesWithTag(tag)) {
            out.push_back(std::to_string(line.priority) + " " + line.text);
        }
        return out;
    }
};

}  // namespace

TEST_F(LoadHookTest, LoadLogsTheBuildAndRegistersBothClasses) {
    JVM_REQUIRE_FRESH_PROCESS();
    load();
    const std::vector<std::string> hook = linesOf(kJniTag);
    ASSERT_EQ(1u, hook.size());
    // The library's build date and time, as the compiler writes them.
    EXPECT_THAT(hook[0], MatchesRegex("4 JNI_OnLoad, libquellborn\\.so is built on "
                                      "[A-Z][a-z]{2} [ 1-3][0-9] [0-9]{4} [0-9]{2}:[0-9]{2}:[0-9]{2}\n"));
    EXPECT_EQ(std::vector<std::string>{"4 " + std::string(kMmeRegistered)}, linesOf(kRegistrationTag));

    EXPECT_EQ(jvm(), vce_jvm);
    ASSERT_NE(nullptr, clazz);
    Local<jclass> vceService(findClass(kVceService));
    EXPECT_TRUE(env()->IsSameObject(clazz, vceService));
}

TEST_F(LoadHookTest, EveryInitCreatesAndRegistersAServiceObject) {
    JVM_REQUIRE_FRESH_PROCESS();
    load();
    EXPECT_EQ(nullptr, registeredService());

    EXPECT_EQ(2, vceServiceInit());
    const android::sp<android::IBinder> first = registeredService();
    ASSERT_NE(nullptr, first);
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kJniTag, "init"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kJniTag, "VideoCallEngineService::Instance return 0"));

    EXPECT_EQ(2, vceServiceInit());
    const android::sp<android::IBinder> second = registeredService();
    ASSERT_NE(nullptr, second);
    EXPECT_NE(first, second);
    EXPECT_EQ(2u, log.count(ANDROID_LOG_INFO, kJniTag, "VideoCallEngineService::Instance return 0"));
}

TEST_F(LoadHookTest, EveryMmeNativeAnswersUnderItsExactSignature) {
    load();
    Local<jstring> key = newString(u"key");
    Local<jobject> context = newContext("app");
    Local<jlongArray> statistics = newLongArray(16, -1);
    struct Native {
        const char* name;
        const char* signature;
        std::vector<jvalue> args;
    };
    const std::vector<Native> natives = {
            {"cfgSetWorkDir", "(Ljava/lang/String;)I", {L(key)}},
            {"cfgSetAppCtx", "(Landroid/content/Context;)I", {L(context)}},
            {"sysInit", "()I", {}},
            {"sysDestroy", "()I", {}},
            {"mmeGetVer", "()Ljava/lang/String;", {}},
            {"mmeSetLogLevel", "(I)I", {I(1)}},
            {"captureStatistics", "(JJ[J)I", {J(0), J(0), L(statistics)}},
            {"zpandModDriveMsg", "()I", {}},
            {"zpandTimerActive", "()I", {}},
            {"provGetValueBool", "(Ljava/lang/String;)Z", {L(key)}},
            {"provGetValueInt", "(Ljava/lang/String;)I", {L(key)}},
            {"provGetValueEnum", "(Ljava/lang/String;)I", {L(key)}},
            {"provGetValueStr", "(Ljava/lang/String;)Ljava/lang/String;", {L(key)}},
            {"provGetMapStr", "(Ljava/lang/String;I)Ljava/lang/String;", {L(key), I(0)}},
            {"startRpcTest", "()I", {}},
            {"endRpcTest", "()I", {}},
    };
    for (const Native& native : natives) {
        SCOPED_TRACE(std::string(native.name) + native.signature);
        const std::string signature = native.signature;
        const size_t before = hostfakes::callCount();
        // A native that is not registered under this signature throws
        // UnsatisfiedLinkError, which fails the case.
        if (signature.back() == 'Z') {
            EXPECT_FALSE(callBool(kMme, native.name, native.signature, native.args));
        } else if (signature.back() == ';') {
            const std::u16string expected = signature == "()Ljava/lang/String;" ? u"melon-1.0|mme-1.0" : u"";
            EXPECT_EQ(expected, callString(kMme, native.name, native.signature, native.args));
        } else {
            const jint result = mme(native.name, native.signature, native.args);
            // The timer report answers a time difference; the rest answer 0.
            if (std::string(native.name) != "zpandTimerActive") {
                EXPECT_EQ(0, result);
            }
        }
        if (std::string(native.name).find("RpcTest") != std::string::npos) {
            EXPECT_EQ(before, hostfakes::callCount()) << "the RPC test natives call nothing";
        }
    }
}

TEST_F(LoadHookTest, TheLibraryExportsItsEntryAndSharedSymbols) {
    load();
    void* library = dlopen(QUELLBORN_LIBRARY_DIR "/libquellborn.so", RTLD_NOW | RTLD_NOLOAD);
    ASSERT_NE(nullptr, library) << dlerror();
    for (const char* symbol : {"JNI_OnLoad", "_Z20getScreenOrientationv", "vce_jvm", "clazz"}) {
        EXPECT_NE(nullptr, dlsym(library, symbol)) << symbol;
    }
    // Only the load hook goes without C++ decoration.
    EXPECT_EQ(nullptr, dlsym(library, "getScreenOrientation"));
    dlclose(library);
}

TEST_F(LoadHookTest, WithoutMmeTheLoadFailsButInitStaysRegistered) {
    JVM_REQUIRE_FRESH_PROCESS();
    useClassPath(QUELLBORN_JAVA_NO_MME);
    // The hook's -2 is a JNI version the JVM refuses.
    EXPECT_EQ("java.lang.UnsatisfiedLinkError", loadLibrary());
    EXPECT_THAT(lastMessage(), HasSubstr("0xFFFFFFFE"));
    EXPECT_EQ(std::vector<std::string>{"6 Failed to find class: com/tessaroval/vce/Mme"},
              linesOf(kRegistrationTag));

    EXPECT_EQ(2, vceServiceInit());
    EXPECT_NE(nullptr, registeredService());
}

TEST_F(LoadHookTest, WithoutVceServiceTheLoadFailsBeforeAnyRegistration) {
    JVM_REQUIRE_FRESH_PROCESS();
    useClassPath(QUELLBORN_JAVA_NO_VCESERVICE);
    EXPECT_EQ("java.lang.UnsatisfiedLinkError", loadLibrary());
    EXPECT_THAT(lastMessage(), HasSubstr("0xFFFFFFFF"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kJniTag, "can not find com/tessaroval/vce/VceService"));
    EXPECT_TRUE(linesOf(kRegistrationTag).empty());
    std::string thrown;
    mme("sysInit", "()I", {}, &thrown);
    EXPECT_EQ("java.lang.UnsatisfiedLinkError", thrown);
    EXPECT_TRUE(hostfakes::callTexts().empty());

    // With no class, the upcall answers 0 and never reaches for the VM.
    EXPECT_EQ(nullptr, clazz);
    UntouchableVm untouchable;
    JavaVM* const real = vce_jvm;
    vce_jvm = untouchable.get();
    EXPECT_EQ(0, getScreenOrientation());
    EXPECT_EQ(0, onNativeThread([] { return getScreenOrientation(); }));
    vce_jvm = real;
    EXPECT_EQ(0, UntouchableVm::touches());
}

TEST_F(LoadHookTest, MmeRegistrationBuildsTheClassNameFromThePrefix) {
    load();
    JNIEnv* e = env();
    EXPECT_EQ(0, android::registerMmeNatives(jvm(), e, "com/tessaroval/vce"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kRegistrationTag, kMmeRegistered));

    EXPECT_EQ(-2, android::registerMmeNatives(jvm(), e, "com/nowhere"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, kRegistrationTag, "Failed to find class: com/nowhere/Mme"));
    EXPECT_FALSE(e->ExceptionCheck());

    // 95 characters and "/Mme" fill the 100-byte buffer exactly; one more
    // and the name would be cut, which is taken as no such class.
    const std::string fits(95, 'a');
    EXPECT_EQ(-2, android::registerMmeNatives(jvm(), e, fits.c_str()));
    EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, kRegistrationTag, "Failed to find class: " + fits + "/Mme"));
    const std::string tooLong = std::string("com/tessaroval/vce") + std::string(102, 'x');
    ASSERT_EQ(120u, tooLong.size());
    EXPECT_EQ(-2, android::registerMmeNatives(jvm(), e, tooLong.c_str()));
    EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, kRegistrationTag,
                             "Failed to find class: " + tooLong.substr(0, 99)));
    EXPECT_EQ(-2, android::registerMmeNatives(jvm(), e, std::string(96, 'a').c_str()));
    EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, kRegistrationTag,
                             "Failed to find class: " + std::string(96, 'a') + "/Mm"));
    EXPECT_FALSE(e->ExceptionCheck());

    // The registration that stands is still the good one.
    EXPECT_EQ(0, mme("startRpcTest", "()I"));
}

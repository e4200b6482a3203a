// The library loaded by a real JVM: what the load hook logs and registers,
// the service that VceService.init brings up, the RPC test natives, the
// exported symbols, and the hook's failure paths when the application lacks
// one of its classes. (Every other Mme native is called under its exact
// signature by the Mme*Test files.)
#include <dlfcn.h>

#include <atomic>

#include "JvmHarness.h"
#include "MmeJni.h"
#include "VceServiceJni.h"

using namespace jvmtest;
using ::testing::HasSubstr;

namespace {

constexpr const char* kJniTag = "VCEService-JNI";
constexpr const char* kRegistrationTag = "Mme-JNI";
constexpr const char* kMmeRegistered = "RegisterNatives, kClassName com/tessaroval/vce/Mme";

// A virtual machine whose every function only counts the call and fails:
// code given it shows whether it touched the VM at all.
std::atomic<int> gTouches{0};
constexpr auto touch = [](JavaVM*, auto...) -> jint { return ++gTouches, JNI_ERR; };
const JNIInvokeInterface kUntouchable = {nullptr, nullptr, nullptr, touch, touch, touch, touch, touch};

class LoadHookTest : public JvmCase {
protected:
    V linesOf(const char* tag) const {
        V out;
        for (const LogLine& line : log.linesWithTag(tag)) {
            out.push_back(std::to_string(line.priority) + " " + line.text);
        }
        return out;
    }
    // A load that the hook fails: the JVM's error and the hook's answer in it.
    void expectFailedLoad(const char* classPath, const char* hookAnswer) {
        useClassPath(classPath);
        EXPECT_EQ("java.lang.UnsatisfiedLinkError", loadLibrary());
        EXPECT_THAT(lastMessage(), HasSubstr(hookAnswer));
    }
};

}  // namespace

TEST_F(LoadHookTest, LoadLogsTheBuildRegistersBothClassesAndEachInitAService) {
    JVM_REQUIRE_FRESH_PROCESS();
    load();
    // The library's build date and time, as the compiler writes them.
    EXPECT_THAT(linesOf(kJniTag),
                ::testing::ElementsAre(::testing::MatchesRegex(
                        "4 JNI_OnLoad, libquellborn\\.so is built on "
                        "[A-Z][a-z]{2} [ 1-3][0-9] [0-9]{4} [0-9]{2}:[0-9]{2}:[0-9]{2}\n")));
    EXPECT_EQ(V{"4 " + std::string(kMmeRegistered)}, linesOf(kRegistrationTag));
    EXPECT_EQ(jvm(), vce_jvm);
    EXPECT_TRUE(clazz != nullptr && env()->IsSameObject(clazz, Local<jclass>(findClass(kVceService))));

    // Each init makes a new service object and registers it in the old one's place.
    EXPECT_EQ(nullptr, registeredService());
    EXPECT_EQ(2, vceServiceInit());
    const android::sp<android::IBinder> first = registeredService();
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kJniTag, "init"));
    EXPECT_EQ(2, vceServiceInit());
    EXPECT_NE(nullptr, first);
    EXPECT_NE(first, registeredService());
    EXPECT_EQ(2u, log.count(ANDROID_LOG_INFO, kJniTag, "VideoCallEngineService::Instance return 0"));
}

TEST_F(LoadHookTest, TheLibraryExportsItsSymbolsAndNamesMmeFromThePrefix) {
    load();
    void* library = dlopen(QUELLBORN_LIBRARY_DIR "/libquellborn.so", RTLD_NOW | RTLD_NOLOAD);
    ASSERT_NE(nullptr, library) << dlerror();
    for (const char* symbol : {"JNI_OnLoad", "_Z20getScreenOrientationv", "vce_jvm", "clazz"}) {
        EXPECT_NE(nullptr, dlsym(library, symbol)) << symbol;
    }
    // Only the load hook goes without C++ decoration.
    EXPECT_EQ(nullptr, dlsym(library, "getScreenOrientation"));
    dlclose(library);

    EXPECT_EQ(0, android::registerMmeNatives(jvm(), env(), "com/tessaroval/vce"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kRegistrationTag, kMmeRegistered));
    // 95 characters and "/Mme" fill the 100-byte buffer exactly; one more
    // and the name would be cut, which is taken as no such class.
    const std::string fits(95, 'a'), cut(96, 'a');
    for (const auto& [prefix, logged] :
         {std::pair<std::string, std::string>{"com/nowhere", "com/nowhere/Mme"},
          {fits, fits + "/Mme"},
          {cut, cut + "/Mm"}}) {
        EXPECT_EQ(-2, android::registerMmeNatives(jvm(), env(), prefix.c_str())) << prefix;
        EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, kRegistrationTag, "Failed to find class: " + logged))
                << prefix;
        EXPECT_FALSE(env()->ExceptionCheck());
    }
    // The registration that stands is still the good one; its RPC test
    // natives (called nowhere else) answer 0 and call nothing.
    EXPECT_EQ(0, mme("startRpcTest", "()I"));
    EXPECT_EQ(0, mme("endRpcTest", "()I"));
    EXPECT_TRUE(hostfakes::callTexts().empty());
}

TEST_F(LoadHookTest, WithoutMmeTheLoadFailsButInitStaysRegistered) {
    JVM_REQUIRE_FRESH_PROCESS();
    // The hook's -2 is a JNI version the JVM refuses.
    expectFailedLoad(QUELLBORN_JAVA_NO_MME, "0xFFFFFFFE");
    EXPECT_EQ(V{"6 Failed to find class: com/tessaroval/vce/Mme"}, linesOf(kRegistrationTag));
    EXPECT_EQ(2, vceServiceInit());
    EXPECT_NE(nullptr, registeredService());
}

TEST_F(LoadHookTest, WithoutVceServiceTheLoadFailsBeforeAnyRegistration) {
    JVM_REQUIRE_FRESH_PROCESS();
    expectFailedLoad(QUELLBORN_JAVA_NO_VCESERVICE, "0xFFFFFFFF");
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kJniTag, "can not find com/tessaroval/vce/VceService"));
    EXPECT_TRUE(linesOf(kRegistrationTag).empty());
    std::string thrown;
    mme("sysInit", "()I", {}, &thrown);
    EXPECT_EQ("java.lang.UnsatisfiedLinkError", thrown);
    EXPECT_TRUE(hostfakes::callTexts().empty());

    // With no class, getScreenOrientation answers 0 on any thread and never
    // reaches for the VM.
    EXPECT_EQ(nullptr, clazz);
    JavaVM untouchable{&kUntouchable};
    JavaVM* const real = vce_jvm;
    vce_jvm = &untouchable;
    EXPECT_EQ(0, getScreenOrientation());
    EXPECT_EQ(0, onNativeThread([] { return getScreenOrientation(); }));
    vce_jvm = real;
    EXPECT_EQ(0, gTouches.load());
}

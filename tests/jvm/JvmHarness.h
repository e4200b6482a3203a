// One embedded JVM per test process, running the Java stand-ins, with
// -Xcheck:jni. The classpath is the whole set of stand-ins unless the
// process asks for another before the first use.
#ifndef QUELLBORN_TESTS_JVMHARNESS_H
#define QUELLBORN_TESTS_JVMHARNESS_H

#include <jni.h>

#include <string>
#include <vector>

namespace jvmtest {

// Picks the classpath of this process's JVM; only before the first jvm().
void useClassPath(const std::string& classPath);

JavaVM* jvm();
// The environment of the calling thread (the thread must be attached).
JNIEnv* env();

// System.loadLibrary("quellborn"); returns the pending exception's class
// name ("" when it loaded) and clears it.
std::string loadLibrary();

// The message of the last exception takeException cleared.
std::string& lastMessage();

// Clears a pending exception and returns its class name ("" when none).
std::string takeException(JNIEnv* env);

jclass findClass(const char* name);

// What the Java side recorded (UpcallLog), and clearing it.
std::vector<std::string> upcalls();
void clearUpcalls();

std::string toString(JNIEnv* env, jstring text);

}  // namespace jvmtest

#endif  // QUELLBORN_TESTS_JVMHARNESS_H

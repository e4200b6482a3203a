// The library's entry: the load hook, the VceService native "init", and the
// screen-orientation upcall other native components of the process use.
#ifndef QUELLBORN_VOLTE_VCESERVICEJNI_H
#define QUELLBORN_VOLTE_VCESERVICEJNI_H

#include <jni.h>

// Exported for other native components of the process.
extern JavaVM* vce_jvm;
extern jclass clazz;

// Asks the Java side for the screen orientation, from any native thread
// (attached for the call when the machine does not know it). 0 when the
// library's load hook could not bind VceService.
int getScreenOrientation();

extern "C" JNIEXPORT jint JNI_OnLoad(JavaVM* vm, void* reserved);

jint VideoCallEngineService_init(JNIEnv* env, jobject thiz);

#endif  // QUELLBORN_VOLTE_VCESERVICEJNI_H

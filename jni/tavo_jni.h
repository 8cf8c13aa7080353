// The Java bridge: what a Java virtual machine calls, and the callback that answers it.
// In: the native methods of com.kestu.tavo.Tavo, for one instance in a process. Out: one call of
// its static postEventFromNative per job, on the job's worker thread.
// Before: core/tavo.h. After: java/com/kestu/tavo/Tavo.java.
#ifndef TAVO_JNI_TAVO_JNI_H
#define TAVO_JNI_TAVO_JNI_H

#include <jni.h>
#include <pthread.h>

#include "core/tavo.h"

extern "C" {

// Serialises init and deinit, which hold it for their whole duration. Null until the first init;
// never destroyed.
extern pthread_mutex_t *tavo_jni_mutex;

// Keeps the virtual machine. Returns JNI_VERSION_1_6, or -1 when the machine has no such version.
JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM *vm, void *reserved);

// Keeps global references to the class of thiz and to obj, the object that every event names, and
// deletes those of an earlier call. Nothing is changed on failure.
JNIEXPORT void JNICALL Java_com_kestu_tavo_Tavo_native_1setup(JNIEnv *env, jobject thiz,
                                                              jobject obj);

// Returns 0; -1 an instance exists (nothing is changed); -2 out of memory; -4 the path is null, the
// file cannot be used, or the class has no postEventFromNative. No instance is left on failure.
JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_init(JNIEnv *env, jobject thiz, jstring path,
                                                     jint mode);

// Takes no lock: called from the thread that calls init and deinit.
// Returns 0 started, or no instance and nothing done; -1 not started.
JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_analyze(JNIEnv *env, jobject thiz, jint hl_param,
                                                        jint max_beats, jint beat_param2);

// Stops a running job and waits for its event.
// Returns 0 released, or there was no instance; -1 called from inside the event (nothing is
// changed).
JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_deinit(JNIEnv *env, jobject thiz);

// Static: sets fnamedec (core/tavo.h) to an empty path, so that no click track is written.
JNIEXPORT void JNICALL Java_com_kestu_tavo_Tavo_disableClickTrack(JNIEnv *env, jclass);

// The callback of every instance that init makes: posts exactly one event, (object, 1, hl_pos,
// beat_count, float[beat_count] or null) for a result, (object, 2, hl_pos, 0, null) for a failure.
// A result whose array the virtual machine cannot give is posted as a failure. The thread is
// attached for the call and left as it was found.
void tavocallback(TAVO_INFO *info);
}

#endif

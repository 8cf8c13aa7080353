// Stage 8: the Java bridge.
//
// Input: calls to the native methods of com.kestu.tavo.Tavo, for one instance per process. Output:
// one call to the static method postEventFromNative per job, on the job's worker thread. Follows
// include/tavo.h and precedes java/com/kestu/tavo/Tavo.java.
#pragma once

#include <jni.h>
#include <pthread.h>

#include "include/tavo.h"

extern "C" {

// Serialises init and deinit, which hold it until they return. It is null until the first init and
// is never destroyed.
extern pthread_mutex_t *tavo_jni_mutex;

// Stores the virtual machine. Returns JNI_VERSION_1_6, or JNI_ERR (-1) if the virtual machine does
// not support that version.
JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM *vm, void *reserved);

// Stores global references to the class of `thiz` and to `obj`, the first argument of every event.
// Deletes the references of an earlier call. Changes nothing on failure.
JNIEXPORT void JNICALL Java_com_kestu_tavo_Tavo_native_1setup(JNIEnv *env, jobject thiz,
                                                              jobject obj);

// Opens a file. If an instance already exists, changes nothing and returns TAVO_ERR_BUSY, whatever
// the path. Returns TAVO_OK on success. On any other failure, leaves no instance and returns
// TAVO_ERR_MEMORY if memory runs out, or TAVO_ERR_HANDLE if the path is null, the file is unusable
// or the class lacks postEventFromNative.
JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_init(JNIEnv *env, jobject thiz, jstring path,
                                                     jint mode);

// Starts the job. Takes no lock, because the host calls it on the thread that calls init and
// deinit. Returns -1 if an instance is open but its job could not be started, otherwise 0.
JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_analyze(JNIEnv *env, jobject thiz, jint hl_param,
                                                        jint max_beats, jint beat_param2);

// Stops a running job and waits until its event has returned. Returns 0 if the instance was
// released or did not exist. During the event, changes nothing and returns -1.
JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_deinit(JNIEnv *env, jobject thiz);

// Static. Sets fnamedec (include/tavo.h) to an empty path so that no click track is written.
JNIEXPORT void JNICALL Java_com_kestu_tavo_Tavo_disableClickTrack(JNIEnv *env, jclass host);

// True if the job of the open instance decoded the file to its end (tavo_is_complete).
JNIEXPORT jboolean JNICALL Java_com_kestu_tavo_Tavo_isComplete(JNIEnv *env, jobject thiz);

// Static. Returns the reason why a file cannot be analysed (tavo_probe) in words. Returns null if
// the file can be analysed.
JNIEXPORT jstring JNICALL Java_com_kestu_tavo_Tavo_reason(JNIEnv *env, jclass host, jstring path);

// The callback of the bridge's instances. Posts exactly one event: (object, 1, hl_pos, beat_count,
// float[beat_count] or null) for a result, (object, 2, hl_pos, 0, null) for a failure. If the
// virtual machine has too little memory for the array, a result becomes a failure. Attaches the
// thread for the call if necessary. If init has not stored the event method, looks it up in the
// stored class.
void tavocallback(TAVO_INFO *info);
}

// A Java virtual machine made of a recorded function table: it keeps the order of the calls, knows
// which references and characters are out, and can be told which function fails. It also holds its
// callers to the rules of the interface; what breaks one is kept in `violations`.
#ifndef TAVO_TESTS_JNI_FAKE_VM_H
#define TAVO_TESTS_JNI_FAKE_VM_H

#include <jni.h>

#include <functional>
#include <string>
#include <vector>

namespace fake_vm {

struct event {
    jobject object;  // as passed
    jint what, arg1, arg2;
    bool has_beats;
    std::vector<float> beats;
    bool on_attached_thread;  // a thread that the bridge attached
};

// Forgets everything but the global references that are out. The calling thread becomes a thread of
// the machine's own.
void reset();

JavaVM *machine();
JNIEnv *environment();  // of the calling thread, which must be attached
jobject new_object();   // a local reference of the calling thread's, as a native method is given
jstring new_string(const std::string &text);

// The n-th call of a function from now on fails (1 the next one), as the interface says: null with
// an exception pending, or an error code. For CallStaticVoidMethod: the Java method throws.
void fail(const std::string &function, int nth = 1);

// Runs inside the Java method, on its thread.
void on_event(std::function<void()> action);

// What the machine has seen, and what is out of it at this moment.
struct record {
    std::vector<std::string> calls;
    std::vector<event> events;
    std::vector<std::string> violations;  // "function: what was wrong"
    std::vector<std::string> log;         // as a device would show it: "priority/tag: text"
    int global_references;
    int local_references;  // without those that new_object and new_string made
    int held_characters;
    int attached_threads;    // attached by the bridge and not detached
    bool exception_pending;  // on the calling thread
};
record seen();
void forget_calls();
void forget_log();

}  // namespace fake_vm

#endif

// A Java virtual machine made of a recorded function table: it knows what it has handed out, and
// can be told which function fails. It also holds its callers to the rules of the interface; what
// breaks one is kept in `violations`.
#ifndef TAVO_TESTS_JNI_FAKE_VM_H
#define TAVO_TESTS_JNI_FAKE_VM_H

#include <jni.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace fake_vm {

struct event {
    jobject object;             // as passed
    std::vector<jint> numbers;  // what, arg1, arg2
    std::optional<std::vector<float>> beats;
};

// What the machine has seen, and what is out of it at this moment.
struct record {
    std::vector<event> events;
    std::string violations;  // lines "function: what was wrong"
    int global_references = 0;
    int lent = 0;                    // local references, characters and threads attached
    bool exception_pending = false;  // on the calling thread
};
record seen();

// The bridge's lines "priority: text" since the last look.
std::string take_log();

// Forgets everything but what is out. The calling thread becomes one of the machine's own.
void reset();

JavaVM *machine();
JNIEnv *environment();  // of the calling thread, which becomes the machine's own if it is unknown
jobject new_object();   // a local reference, as a native method is given; not counted
jstring new_string(const std::string &text);

// The n-th call of a function from now on fails (1 the next one), as the interface says: null with
// an exception pending, or an error code. For CallStaticVoidMethod: the Java method throws.
void fail(const std::string &function, int nth = 1);

// Runs inside the Java method, on its thread.
void on_event(std::function<void()> action);

}  // namespace fake_vm

#endif

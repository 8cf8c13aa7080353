// A Java virtual machine made of a function table: it knows one class with one method, counts what
// it has handed out, and can be told which function fails. The rules of the interface are tested
// in a real machine.
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

// Counts of what is out of the machine at this moment, and of wrong calls.
struct balance {
    int global_references = 0;
    int lent = 0;   // local references, characters, attached threads
    int wrong = 0;  // calls while an exception is pending, with a dead class, by another name
    bool pending = false;
};

JavaVM *machine();
JNIEnv *environment();

// Forgets events, log and failures; what is out stays out. The calling thread becomes one that the
// machine knows.
void reset();

// References as a native method is given them; not counted.
jobject new_object();
jstring new_string(const std::string &text);

// The n-th call of a function from now on fails (1 the next one) as the interface says: null with
// an exception pending, or an error code. For CallStaticVoidMethod: the Java method throws.
void fail(const std::string &function, int nth = 1);

// Runs an action inside each call of a function, on its thread.
void during(const std::string &function, std::function<void()> action);

balance held();
std::vector<event> take_events();
std::string take_log();  // the bridge's lines "priority: text" since the last look

}  // namespace fake_vm

#endif

// A Java virtual machine made of a function table: it knows one class with one method, counts what
// it has handed out, and a test chooses which function fails. The rules of the interface are tested
// in a real machine. Included by one file only.
#ifndef TAVO_TESTS_JNI_FAKE_VM_H
#define TAVO_TESTS_JNI_FAKE_VM_H

#include <jni.h>

#include <atomic>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

namespace fake_vm {

struct event {
    jobject object;             // as passed
    std::vector<jint> numbers;  // what, arg1, arg2
    std::optional<std::vector<float>> beats;
};

// What is out of the machine: references, and in lent also characters and attached threads.
std::atomic<int> global_references, lent, methods;
std::atomic<bool> pending;  // an exception
std::atomic<int> wrong;     // calls while one is pending

// A test's settings of the machine, and what the machine has recorded.
struct {
    // The n-th call of a function from now on fails (1 the next one) as the interface says: null
    // with an exception pending, or an error code. For CallStaticVoidMethod: the method throws.
    std::string failing = {};
    int nth = 1;
    // Runs inside each call of a function, on its thread.
    std::string watched = {};
    std::function<void()> action = {};

    std::vector<event> events = {};
    std::string log_lines = {};  // the bridge's lines "priority: text"
} now;
std::mutex lock;  // guards events and lines

const std::thread::id own_thread = std::this_thread::get_id();
std::vector<float> array;  // there is one array at a time

// At the beginning of each call that may fail.
bool fails(const std::string &function) {
    if (function == now.watched) now.action();
    if (pending) ++wrong;
    return function == now.failing && --now.nth == 0;
}

// A new reference; null, with an exception pending, if the call fails or the name is not known.
template <typename T = jobject>
T give(const std::string &function, std::atomic<int> *count, bool known = true) {
    static std::atomic<uintptr_t> last_handle;
    pending = fails(function) || !known;
    *count += pending ? 0 : 1;
    return pending ? nullptr : reinterpret_cast<T>(++last_handle);
}

void call_java(JNIEnv *, jclass, jmethodID, va_list args) {
    event got = {va_arg(args, jobject), {}, {}};
    for (int i = 0; i < 3; ++i) got.numbers.push_back(va_arg(args, jint));
    if (va_arg(args, jobject) != nullptr) got.beats = array;
    pending = fails("CallStaticVoidMethod");
    const std::lock_guard<std::mutex> guard(lock);
    now.events.push_back(got);
}

JNINativeInterface_ functions() {
    JNINativeInterface_ table = {};
    table.GetObjectClass = [](JNIEnv *, jobject) { return give<jclass>("GetObjectClass", &lent); };
    table.FindClass = [](JNIEnv *, const char *name) {
        return give<jclass>("FindClass", &lent, name == std::string("com/kestu/tavo/Tavo"));
    };
    table.GetStaticMethodID = [](JNIEnv *, jclass, const char *name, const char *signature) {
        const std::string method = name + std::string(signature);
        return give<jmethodID>("GetStaticMethodID", &methods,
                               method == "postEventFromNative(Ljava/lang/Object;III[F)V");
    };
    table.NewGlobalRef = [](JNIEnv *, jobject) { return give("NewGlobalRef", &global_references); };
    // A string is its characters; each release ends one copy.
    table.GetStringUTFChars = [](JNIEnv *, jstring string, jboolean *) -> const char * {
        const char *characters = reinterpret_cast<const char *>(string);
        return give("GetStringUTFChars", &lent) != nullptr ? strdup(characters) : nullptr;
    };
    table.ReleaseStringUTFChars = [](JNIEnv *, jstring, const char *characters) {
        fails("ReleaseStringUTFChars");
        free(const_cast<char *>(characters));
        --lent;
    };
    table.NewFloatArray = [](JNIEnv *, jsize length) {
        array.assign(static_cast<size_t>(length), 0.0f);
        return give<jfloatArray>("NewFloatArray", &lent);
    };
    table.SetFloatArrayRegion = [](JNIEnv *, jfloatArray, jsize start, jsize length,
                                   const jfloat *from) {
        for (jsize i = 0; i < length; ++i) array.at(static_cast<size_t>(start + i)) = from[i];
    };
    table.CallStaticVoidMethodV = call_java;
    table.DeleteGlobalRef = [](JNIEnv *, jobject) { --global_references; };
    table.DeleteLocalRef = [](JNIEnv *, jobject) { --lent; };
    table.ExceptionCheck = [](JNIEnv *) -> jboolean { return pending; };
    table.ExceptionClear = [](JNIEnv *) { pending = false; };
    return table;
}
const JNINativeInterface_ function_table = functions();
JNIEnv env = {&function_table};

JNIInvokeInterface_ threads() {
    JNIInvokeInterface_ table = {};
    table.GetEnv = [](JavaVM *, void **got, jint version) {
        if (fails("GetEnv") || version != JNI_VERSION_1_6) return JNI_EVERSION;
        *got = &env;
        return std::this_thread::get_id() == own_thread ? JNI_OK : JNI_EDETACHED;
    };
    table.AttachCurrentThread = [](JavaVM *, void **got, void *) {
        if (fails("AttachCurrentThread")) return JNI_ERR;
        *got = &env;
        ++lent;
        return JNI_OK;
    };
    table.DetachCurrentThread = [](JavaVM *) {
        --lent;
        return JNI_OK;
    };
    return table;
}
const JNIInvokeInterface_ thread_table = threads();
JavaVM machine = {&thread_table};

}  // namespace fake_vm

// Takes the log library's place for everything in this program: the program's symbols come first.
extern "C" __attribute__((visibility("default"), format(printf, 3, 4))) int __android_log_print(
    int prio, const char *tag, const char *fmt, ...) {
    char text[512];
    va_list args;
    va_start(args, fmt);
    vsnprintf(text, sizeof text, fmt, args);
    va_end(args);
    const std::lock_guard<std::mutex> guard(fake_vm::lock);
    if (tag != std::string("tavo_jni")) return 1;
    fake_vm::now.log_lines += std::to_string(prio) + ": " + text + "\n";
    return 1;
}

#endif

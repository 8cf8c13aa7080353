// A fake Java virtual machine with one class and one method. It counts the references that it
// returns, and a test can make one of its functions fail. Only one file may include this header.
#pragma once

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
    jobject object;
    std::vector<jint> numbers;  // the event's kind and two arguments
    std::optional<std::vector<float>> beats;
};

// Resources that the bridge has not released. `unreturned` counts local references, strings and
// attached threads.
std::atomic<int> global_references, unreturned, methods;
std::atomic<bool> pending;         // true while an exception is pending
std::atomic<int> misplaced_calls;  // number of calls made while an exception was pending

// The settings that a test makes, and the events that the machine recorded.
struct {
    // The nth call to this function fails; 1 is the next call. Depending on the function, it
    // returns an error code, or null with an exception pending.
    std::string failing = {};
    int nth = 1;
    // Each call to this function runs the action.
    std::string watched = {};
    std::function<void()> action = {};

    std::vector<event> events = {};
    std::string log_lines = {};  // written by the bridge, each as "priority: text"
} machine_state;
std::mutex lock;  // guards events and log_lines

const std::thread::id own_thread = std::this_thread::get_id();
std::vector<float> array;  // only one array exists at a time

// Every function that may fail calls this first.
bool must_fail(const std::string &function) {
    if (function == machine_state.watched) machine_state.action();
    if (pending) ++misplaced_calls;
    return function == machine_state.failing && --machine_state.nth == 0;
}

// Returns a new reference. If the call fails, returns null with an exception pending.
template <typename T = jobject>
T create_reference(const std::string &function, std::atomic<int> *count, bool exists = true) {
    static std::atomic<uintptr_t> last_handle;
    pending = must_fail(function) || !exists;
    *count += pending ? 0 : 1;
    return pending ? nullptr : reinterpret_cast<T>(++last_handle);
}

void call_java(JNIEnv *, jclass, jmethodID, va_list args) {
    event got = {va_arg(args, jobject), {}, {}};
    for (int i = 0; i < 3; ++i) got.numbers.push_back(va_arg(args, jint));
    if (va_arg(args, jobject) != nullptr) got.beats = array;
    pending = must_fail("CallStaticVoidMethod");
    const std::lock_guard<std::mutex> guard(lock);
    machine_state.events.push_back(got);
}

JNINativeInterface_ functions() {
    JNINativeInterface_ table = {};
    table.GetObjectClass = [](JNIEnv *, jobject) {
        return create_reference<jclass>("GetObjectClass", &unreturned);
    };
    table.FindClass = [](JNIEnv *, const char *name) {
        return create_reference<jclass>("FindClass", &unreturned,
                                        name == std::string("com/kestu/tavo/Tavo"));
    };
    table.GetStaticMethodID = [](JNIEnv *, jclass, const char *name, const char *signature) {
        const std::string method = name + std::string(signature);
        return create_reference<jmethodID>(
            "GetStaticMethodID", &methods,
            method == "postEventFromNative(Ljava/lang/Object;III[F)V");
    };
    table.NewGlobalRef = [](JNIEnv *, jobject) {
        return create_reference("NewGlobalRef", &global_references);
    };
    // A string's handle points to its characters. The bridge receives a copy and releases it.
    table.GetStringUTFChars = [](JNIEnv *, jstring string, jboolean *) -> const char * {
        const char *characters = reinterpret_cast<const char *>(string);
        return create_reference("GetStringUTFChars", &unreturned) != nullptr ? strdup(characters)
                                                                             : nullptr;
    };
    table.ReleaseStringUTFChars = [](JNIEnv *, jstring, const char *characters) {
        must_fail("ReleaseStringUTFChars");
        free(const_cast<char *>(characters));
        --unreturned;
    };
    table.NewFloatArray = [](JNIEnv *, jsize length) {
        array.assign(static_cast<size_t>(length), 0.0f);
        return create_reference<jfloatArray>("NewFloatArray", &unreturned);
    };
    table.SetFloatArrayRegion = [](JNIEnv *, jfloatArray, jsize start, jsize length,
                                   const jfloat *values) {
        for (jsize i = 0; i < length; ++i) array.at(static_cast<size_t>(start + i)) = values[i];
    };
    table.CallStaticVoidMethodV = call_java;
    table.DeleteGlobalRef = [](JNIEnv *, jobject) { --global_references; };
    table.DeleteLocalRef = [](JNIEnv *, jobject) { --unreturned; };
    table.ExceptionCheck = [](JNIEnv *) -> jboolean { return pending; };
    table.ExceptionClear = [](JNIEnv *) { pending = false; };
    return table;
}
const JNINativeInterface_ function_table = functions();
JNIEnv env = {&function_table};

JNIInvokeInterface_ threads() {
    JNIInvokeInterface_ table = {};
    table.GetEnv = [](JavaVM *, void **got, jint version) {
        if (must_fail("GetEnv") || version != JNI_VERSION_1_6) return JNI_EVERSION;
        *got = &env;
        return std::this_thread::get_id() == own_thread ? JNI_OK : JNI_EDETACHED;
    };
    table.AttachCurrentThread = [](JavaVM *, void **got, void *) {
        if (must_fail("AttachCurrentThread")) return JNI_ERR;
        *got = &env;
        ++unreturned;
        return JNI_OK;
    };
    table.DetachCurrentThread = [](JavaVM *) {
        --unreturned;
        return JNI_OK;
    };
    return table;
}
const JNIInvokeInterface_ thread_table = threads();
JavaVM machine = {&thread_table};

}  // namespace fake_vm

// Replaces the log library's function, because the program's symbols precede those of libraries.
extern "C" __attribute__((visibility("default"), format(printf, 3, 4))) int __android_log_print(
    int prio, const char *tag, const char *fmt, ...) {
    char text[512];
    va_list args;
    va_start(args, fmt);
    vsnprintf(text, sizeof text, fmt, args);
    va_end(args);
    const std::lock_guard<std::mutex> guard(fake_vm::lock);
    if (tag != std::string("tavo_jni")) return 1;
    fake_vm::machine_state.log_lines += std::to_string(prio) + ": " + text + "\n";
    return 1;
}

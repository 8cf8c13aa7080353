// A Java virtual machine made of a function table: it knows one class with one method, counts what
// it has handed out, and can be told which function fails. The rules of the interface are tested in
// a real machine. Included by one file only.
#ifndef TAVO_TESTS_JNI_FAKE_VM_H
#define TAVO_TESTS_JNI_FAKE_VM_H

#include <jni.h>

#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace fake_vm {

struct event {
    jobject object;             // as passed
    std::vector<jint> numbers;  // what, arg1, arg2
    std::optional<std::vector<float>> beats;
};

// What is out of the machine at this moment, and wrong calls.
struct balance {
    int global_references = 0;
    int lent = 0;   // local references, characters, attached threads
    int wrong = 0;  // calls while an exception is pending, or with a class that is gone
    bool pending = false;
};

std::mutex lock;  // guards all of the following
balance now;
std::vector<event> events;
std::string log_lines;     // the bridge's lines "priority: text"
std::set<void *> classes;  // those alive
std::vector<float> array;  // there is one at a time
std::thread::id own_thread;
uintptr_t last_handle = 0x1000;
std::string failing, watched;
int calls_to_failure = 0;
std::function<void()> action;

using guard = std::lock_guard<std::mutex>;

// The n-th call of a function from now on fails (1 the next one) as the interface says: null with
// an exception pending, or an error code. For CallStaticVoidMethod: the Java method throws.
void fail(const std::string &function, int nth = 1) {
    failing = function;
    calls_to_failure = nth;
}

// Runs an action inside each call of a function, on its thread.
void during(const std::string &function, std::function<void()> run) {
    watched = function;
    action = std::move(run);
}

// Forgets events, log and failures; what is out stays out. The calling thread becomes the only one
// that is attached from the start.
void reset() {
    events.clear();
    log_lines.clear();
    fail("");
    during("", nullptr);
    now.wrong = 0;
    now.pending = false;
    own_thread = std::this_thread::get_id();
}

template <typename T>
T take(T *kept) {
    const guard hold(lock);
    return std::exchange(*kept, {});
}

// At the beginning of each call that may fail; false if it does.
bool succeeds(const std::string &function) {
    if (function == watched && action) action();
    const guard hold(lock);
    if (now.pending) ++now.wrong;
    now.pending = function == failing && --calls_to_failure == 0;
    return !now.pending;
}

// A new reference, counted; null if it is not given.
template <typename T = jobject>
T hand_out(int *count, bool given = true, bool is_class = false) {
    const guard hold(lock);
    now.pending = !given;
    if (!given) return nullptr;
    ++*count;
    const auto made = reinterpret_cast<T>(++last_handle);
    if (is_class) classes.insert(made);
    return made;
}

void take_back(void *reference, int *count) {
    const guard hold(lock);
    classes.erase(reference);
    --*count;
}

void call_java(jclass of, va_list args) {
    event got = {va_arg(args, jobject), {}, {}};
    for (int i = 0; i < 3; ++i) got.numbers.push_back(va_arg(args, jint));
    if (va_arg(args, jobject) != nullptr) got.beats = array;
    {
        const guard hold(lock);
        events.push_back(got);
    }
    succeeds("CallStaticVoidMethod");
    const guard hold(lock);
    now.wrong += classes.count(of) == 0 ? 1 : 0;  // also if it was released meanwhile
}

JNINativeInterface_ functions() {
    JNINativeInterface_ table = {};
    table.GetObjectClass = [](JNIEnv *, jobject) {
        return hand_out<jclass>(&now.lent, succeeds("GetObjectClass"), true);
    };
    table.FindClass = [](JNIEnv *, const char *name) {
        const bool known = name == std::string("com/kestu/tavo/Tavo");
        return hand_out<jclass>(&now.lent, succeeds("FindClass") && known, true);
    };
    table.GetStaticMethodID = [](JNIEnv *, jclass, const char *name, const char *signature) {
        const bool known =
            name + std::string(signature) == "postEventFromNative(Ljava/lang/Object;III[F)V";
        int method = 0;
        return hand_out<jmethodID>(&method, succeeds("GetStaticMethodID") && known);
    };
    table.NewGlobalRef = [](JNIEnv *, jobject object) {
        const bool given = succeeds("NewGlobalRef");
        std::unique_lock<std::mutex> hold(lock);
        const bool is_class = classes.count(object) != 0;
        hold.unlock();
        return hand_out(&now.global_references, given, is_class);
    };
    table.GetStringUTFChars = [](JNIEnv *, jstring string, jboolean *) {
        const bool given = hand_out(&now.lent, succeeds("GetStringUTFChars")) != nullptr;
        return given ? reinterpret_cast<const char *>(string) : nullptr;
    };
    table.NewFloatArray = [](JNIEnv *, jsize length) {
        array.resize(static_cast<size_t>(length));
        return hand_out<jfloatArray>(&now.lent, succeeds("NewFloatArray"));
    };
    table.SetFloatArrayRegion = [](JNIEnv *, jfloatArray, jsize start, jsize length,
                                   const jfloat *from) {
        for (jsize i = 0; i < length; ++i) array.at(static_cast<size_t>(start + i)) = from[i];
    };
    table.DeleteGlobalRef = [](JNIEnv *, jobject it) { take_back(it, &now.global_references); };
    table.DeleteLocalRef = [](JNIEnv *, jobject it) { take_back(it, &now.lent); };
    table.ReleaseStringUTFChars = [](JNIEnv *, jstring, const char *) {
        take_back(nullptr, &now.lent);
    };
    table.CallStaticVoidMethodV = [](JNIEnv *, jclass of, jmethodID, va_list args) {
        call_java(of, args);
    };
    table.ExceptionCheck = [](JNIEnv *) {
        const guard hold(lock);
        return static_cast<jboolean>(now.pending);
    };
    table.ExceptionClear = [](JNIEnv *) {
        const guard hold(lock);
        now.pending = false;
    };
    return table;
}

const JNINativeInterface_ function_table = functions();
JNIEnv env = {&function_table};

JNIInvokeInterface_ threads() {
    JNIInvokeInterface_ table = {};
    table.GetEnv = [](JavaVM *, void **got, jint version) {
        const bool given = succeeds("GetEnv") && version == JNI_VERSION_1_6;
        if (!given) now.pending = false;  // an error code is all that these give
        const bool known = std::this_thread::get_id() == own_thread;
        *got = given && known ? &env : nullptr;
        return !given ? JNI_EVERSION : known ? JNI_OK : JNI_EDETACHED;
    };
    table.AttachCurrentThread = [](JavaVM *, void **got, void *) {
        const bool given = hand_out(&now.lent, succeeds("AttachCurrentThread")) != nullptr;
        *got = given ? &env : nullptr;
        if (!given) now.pending = false;
        return given ? JNI_OK : JNI_ERR;
    };
    table.DetachCurrentThread = [](JavaVM *) {
        take_back(nullptr, &now.lent);
        return JNI_OK;
    };
    return table;
}

const JNIInvokeInterface_ thread_table = threads();
JavaVM machine = {&thread_table};

// A reference as a native method is given it; not counted.
jobject new_object() {
    int parameter = 0;
    return hand_out(&parameter);
}

}  // namespace fake_vm

// Takes the log library's place for everything in this program: the program's symbols come first.
extern "C" __attribute__((visibility("default"), format(printf, 3, 4))) int __android_log_print(
    int prio, const char *tag, const char *fmt, ...) {
    char text[512];
    va_list args;
    va_start(args, fmt);
    vsnprintf(text, sizeof text, fmt, args);
    va_end(args);
    const fake_vm::guard hold(fake_vm::lock);
    if (tag == std::string("tavo_jni")) {
        fake_vm::log_lines += std::to_string(prio) + ": " + text + "\n";
    }
    return 1;
}

#endif

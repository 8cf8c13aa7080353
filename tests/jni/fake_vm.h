// A Java virtual machine made of a recorded function table: it knows what it has handed out, and
// can be told which function fails. It also holds its callers to the rules of the interface; what
// breaks one is kept in `violations`.
#ifndef TAVO_TESTS_JNI_FAKE_VM_H
#define TAVO_TESTS_JNI_FAKE_VM_H

#include <jni.h>

#include <cstdarg>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace fake_vm {

enum class thread_kind { unknown, own, attached };

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

struct reference {
    std::vector<float> floats;
    std::string text;
};

// What may be called while an exception is pending.
inline const std::set<std::string> kAlwaysAllowed = {"DeleteGlobalRef", "DeleteLocalRef",
                                                     "ReleaseStringUTFChars", "ExceptionCheck",
                                                     "ExceptionClear"};

inline std::mutex lock;  // guards everything below but the thread's own state
inline record now;
inline std::string log_lines;
inline std::map<jobject, reference> references;  // no handle is given twice
inline uintptr_t next_handle = 0x1000;
inline std::string failing;
inline int calls_to_failure = 0;
inline std::function<void()> event_action;

inline thread_local thread_kind this_thread = thread_kind::unknown;
inline thread_local bool pending = false;

using guard = std::lock_guard<std::mutex>;

// Each of the following is called with the lock held.

inline void require(bool holds, const std::string &function, const std::string &what) {
    if (!holds) now.violations += function + ": " + what + "\n";
}

inline bool succeeds(const std::string &function) {
    return function != failing || --calls_to_failure != 0;
}

// At the beginning of each call. False: it is to fail, and the exception is pending.
inline bool enter(const std::string &function, const std::vector<jobject> &passed = {}) {
    require(this_thread != thread_kind::unknown, function, "thread not attached");
    require(!pending || kAlwaysAllowed.count(function) != 0, function, "exception pending");
    for (const jobject each : passed) {
        require(references.count(each) != 0, function, "not a live reference");
    }
    if (succeeds(function)) return true;
    pending = true;
    return false;
}

inline jobject add(reference made) {
    const jobject handle = reinterpret_cast<jobject>(next_handle++);
    references[handle] = std::move(made);
    return handle;
}

template <typename T>
T lend(reference made = {}) {
    ++now.lent;
    return static_cast<T>(add(std::move(made)));
}

inline void call_java(jclass of, va_list args) {
    std::unique_lock<std::mutex> hold(lock);
    event got = {};
    got.object = va_arg(args, jobject);
    for (int i = 0; i < 3; ++i) got.numbers.push_back(va_arg(args, jint));
    const jobject array = va_arg(args, jobject);
    if (array != nullptr) got.beats = references[array].floats;
    now.events.push_back(got);

    std::vector<jobject> passed = {of};
    if (got.object != nullptr) passed.push_back(got.object);
    if (array != nullptr) passed.push_back(array);
    const bool throws = !enter("CallStaticVoidMethod", passed);
    pending = false;  // the method is still running
    const std::function<void()> action = event_action;
    hold.unlock();
    if (action) action();
    hold.lock();
    require(references.count(of) != 0, "CallStaticVoidMethod", "the class is gone while it runs");
    pending = throws;
}

inline void put_references(JNINativeInterface_ *table) {
    table->GetObjectClass = [](JNIEnv *, jobject object) {
        guard hold(lock);
        return enter("GetObjectClass", {object}) ? lend<jclass>() : nullptr;
    };
    table->FindClass = [](JNIEnv *, const char *) {
        guard hold(lock);
        return enter("FindClass") ? lend<jclass>() : nullptr;
    };
    table->NewGlobalRef = [](JNIEnv *, jobject object) {
        guard hold(lock);
        if (!enter("NewGlobalRef", {object})) return jobject{};
        ++now.global_references;
        return add({});
    };
    table->DeleteGlobalRef = [](JNIEnv *, jobject object) {
        guard hold(lock);
        enter("DeleteGlobalRef", {object});
        now.global_references -= static_cast<int>(references.erase(object));
    };
    table->DeleteLocalRef = [](JNIEnv *, jobject object) {
        guard hold(lock);
        enter("DeleteLocalRef", {object});
        now.lent -= static_cast<int>(references.erase(object));
    };
}

inline void put_values(JNINativeInterface_ *table) {
    table->GetStringUTFChars = [](JNIEnv *, jstring string, jboolean *) {
        guard hold(lock);
        if (!enter("GetStringUTFChars", {string})) return static_cast<const char *>(nullptr);
        ++now.lent;
        return references[string].text.c_str();
    };
    table->ReleaseStringUTFChars = [](JNIEnv *, jstring string, const char *) {
        guard hold(lock);
        enter("ReleaseStringUTFChars", {string});
        --now.lent;
    };
    table->NewFloatArray = [](JNIEnv *, jsize length) {
        guard hold(lock);
        if (!enter("NewFloatArray")) return jfloatArray{};
        return lend<jfloatArray>({std::vector<float>(static_cast<size_t>(length)), {}});
    };
    table->SetFloatArrayRegion = [](JNIEnv *, jfloatArray array, jsize start, jsize length,
                                    const jfloat *from) {
        guard hold(lock);
        enter("SetFloatArrayRegion", {array});
        for (jsize i = 0; i < length; ++i) {
            references[array].floats.at(static_cast<size_t>(start + i)) = from[i];
        }
    };
}

inline void put_calls(JNINativeInterface_ *table) {
    table->GetStaticMethodID = [](JNIEnv *, jclass of, const char *, const char *) {
        guard hold(lock);
        const bool found = enter("GetStaticMethodID", {of});
        return found ? reinterpret_cast<jmethodID>(uintptr_t{0x500}) : nullptr;
    };
    table->CallStaticVoidMethodV = [](JNIEnv *, jclass of, jmethodID, va_list args) {
        call_java(of, args);
    };
    table->ExceptionCheck = [](JNIEnv *) {
        guard hold(lock);
        enter("ExceptionCheck");
        return static_cast<jboolean>(pending);
    };
    table->ExceptionClear = [](JNIEnv *) {
        guard hold(lock);
        enter("ExceptionClear");
        pending = false;
    };
}

// Of the calling thread, which becomes the machine's own if it is unknown. Whatever else the bridge
// calls is null and ends the program.
inline JNIEnv *environment() {
    static const JNINativeInterface_ table = [] {
        JNINativeInterface_ made = {};
        put_references(&made);
        put_values(&made);
        put_calls(&made);
        return made;
    }();
    static JNIEnv env = {&table};
    if (this_thread == thread_kind::unknown) this_thread = thread_kind::own;
    return &env;
}

inline void put_threads(JNIInvokeInterface_ *table) {
    table->GetEnv = [](JavaVM *, void **env, jint) {
        guard hold(lock);
        *env = nullptr;
        if (!succeeds("GetEnv")) return JNI_EVERSION;
        if (this_thread == thread_kind::unknown) return JNI_EDETACHED;
        *env = environment();
        return JNI_OK;
    };
    table->AttachCurrentThread = [](JavaVM *, void **env, void *) {
        guard hold(lock);
        *env = nullptr;
        if (!succeeds("AttachCurrentThread")) return JNI_ERR;
        require(this_thread == thread_kind::unknown, "AttachCurrentThread", "attached already");
        this_thread = thread_kind::attached;
        ++now.lent;
        *env = environment();
        return JNI_OK;
    };
    table->DetachCurrentThread = [](JavaVM *) {
        guard hold(lock);
        require(this_thread == thread_kind::attached, "DetachCurrentThread", "not attached by it");
        require(!pending, "DetachCurrentThread", "exception pending");
        this_thread = thread_kind::unknown;
        --now.lent;
        return JNI_OK;
    };
}

inline record seen() {
    guard hold(lock);
    now.exception_pending = pending;
    return now;
}

// The bridge's lines "priority: text" since the last look.
inline std::string take_log() {
    guard hold(lock);
    return std::exchange(log_lines, std::string());
}

// Forgets everything but what is out. The calling thread becomes one of the machine's own.
inline void reset() {
    guard hold(lock);
    now.events.clear();
    now.violations.clear();
    log_lines.clear();
    failing.clear();
    event_action = nullptr;
    this_thread = thread_kind::own;
    pending = false;
}

inline JavaVM *machine() {
    static const JNIInvokeInterface_ table = [] {
        JNIInvokeInterface_ made = {};
        put_threads(&made);
        return made;
    }();
    static JavaVM vm = {&table};
    return &vm;
}

// A local reference, as a native method is given; not counted.
inline jobject new_object() {
    guard hold(lock);
    return add({});
}

inline jstring new_string(const std::string &text) {
    guard hold(lock);
    return static_cast<jstring>(add({{}, text}));
}

// The n-th call of a function from now on fails (1 the next one), as the interface says: null with
// an exception pending, or an error code. For CallStaticVoidMethod: the Java method throws.
inline void fail(const std::string &function, int nth = 1) {
    guard hold(lock);
    failing = function;
    calls_to_failure = nth;
}

// Runs inside the Java method, on its thread.
inline void on_event(std::function<void()> action) {
    guard hold(lock);
    event_action = std::move(action);
}

}  // namespace fake_vm

#endif

#include "tests/jni/fake_vm.h"

#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <map>
#include <mutex>
#include <set>
#include <thread>
#include <utility>

namespace {

using fake_vm::event;
using guard = std::lock_guard<std::mutex>;

std::mutex lock;  // guards all of the following
fake_vm::balance now;
std::vector<event> events;
std::string log_lines;
std::set<jobject> classes;  // those alive
std::map<jobject, std::string> strings;
std::map<jobject, std::vector<float>> arrays;
std::set<std::thread::id> known_threads;
uintptr_t last_handle = 0x1000;
std::string failing, watched;
int calls_to_failure = 0;
std::function<void()> action;

// At the beginning of each call that may fail; false when it does.
bool succeeds(const std::string &function) {
    std::function<void()> run;
    {
        const guard hold(lock);
        if (function == watched) run = action;
    }
    if (run) run();
    const guard hold(lock);
    if (now.pending) ++now.wrong;
    return function != failing || --calls_to_failure != 0;
}

template <typename T>
T new_handle() {
    return reinterpret_cast<T>(++last_handle);
}

// The answer of a call that hands out a local reference.
template <typename T>
T lend(const char *function, bool known = true) {
    const bool given = succeeds(function);
    const guard hold(lock);
    now.pending = !given || !known;
    if (now.pending) return nullptr;
    ++now.lent;
    return new_handle<T>();
}

jclass lend_class(const char *function, bool known = true) {
    const auto made = lend<jclass>(function, known);
    const guard hold(lock);
    if (made != nullptr) classes.insert(made);
    return made;
}

void call_java(jclass of, va_list args) {
    event got = {va_arg(args, jobject), {}, {}};
    for (int i = 0; i < 3; ++i) got.numbers.push_back(va_arg(args, jint));
    const jobject array = va_arg(args, jobject);
    {
        const guard hold(lock);
        if (array != nullptr) got.beats = arrays.at(array);
        events.push_back(got);
    }
    const bool throws = !succeeds("CallStaticVoidMethod");
    const guard hold(lock);
    now.wrong += classes.count(of) == 0 ? 1 : 0;  // also when it was released meanwhile
    now.pending = throws;
}

void release(jobject reference, int *count) {
    const guard hold(lock);
    classes.erase(reference);
    arrays.erase(reference);
    --*count;
}

JNINativeInterface_ functions() {
    JNINativeInterface_ table = {};
    table.GetObjectClass = [](JNIEnv *, jobject) { return lend_class("GetObjectClass"); };
    table.FindClass = [](JNIEnv *, const char *name) {
        return lend_class("FindClass", name == std::string("com/kestu/tavo/Tavo"));
    };
    table.GetStaticMethodID = [](JNIEnv *, jclass, const char *name, const char *signature) {
        const bool known =
            std::string(name) + signature == "postEventFromNative(Ljava/lang/Object;III[F)V";
        const bool given = succeeds("GetStaticMethodID");
        const guard hold(lock);
        now.pending = !given || !known;
        return now.pending ? nullptr : reinterpret_cast<jmethodID>(uintptr_t{0x500});
    };
    table.NewGlobalRef = [](JNIEnv *, jobject object) {
        const bool given = succeeds("NewGlobalRef");
        const guard hold(lock);
        now.pending = !given;
        if (!given) return jobject{};
        ++now.global_references;
        const auto made = new_handle<jobject>();
        if (classes.count(object) != 0) classes.insert(made);
        return made;
    };
    table.DeleteGlobalRef = [](JNIEnv *, jobject it) { release(it, &now.global_references); };
    table.DeleteLocalRef = [](JNIEnv *, jobject it) { release(it, &now.lent); };
    table.GetStringUTFChars = [](JNIEnv *, jstring string, jboolean *) {
        const bool given = lend<jobject>("GetStringUTFChars") != nullptr;
        const guard hold(lock);
        return given ? strings.at(string).c_str() : nullptr;
    };
    table.ReleaseStringUTFChars = [](JNIEnv *, jstring, const char *) {
        release(nullptr, &now.lent);
    };
    table.NewFloatArray = [](JNIEnv *, jsize length) {
        const auto made = lend<jfloatArray>("NewFloatArray");
        const guard hold(lock);
        if (made != nullptr) arrays[made].resize(static_cast<size_t>(length));
        return made;
    };
    table.SetFloatArrayRegion = [](JNIEnv *, jfloatArray array, jsize start, jsize length,
                                   const jfloat *from) {
        const guard hold(lock);
        for (jsize i = 0; i < length; ++i) {
            arrays.at(array).at(static_cast<size_t>(start + i)) = from[i];
        }
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

JNIInvokeInterface_ threads() {
    JNIInvokeInterface_ table = {};
    table.GetEnv = [](JavaVM *, void **env, jint version) {
        const bool given = succeeds("GetEnv") && version == JNI_VERSION_1_6;
        const guard hold(lock);
        const bool known = known_threads.count(std::this_thread::get_id()) != 0;
        *env = given && known ? fake_vm::environment() : nullptr;
        return !given ? JNI_EVERSION : known ? JNI_OK : JNI_EDETACHED;
    };
    table.AttachCurrentThread = [](JavaVM *, void **env, void *) {
        const bool given = succeeds("AttachCurrentThread");
        const guard hold(lock);
        *env = given ? fake_vm::environment() : nullptr;
        if (!given) return JNI_ERR;
        now.lent += known_threads.insert(std::this_thread::get_id()).second ? 1 : 0;
        return JNI_OK;
    };
    table.DetachCurrentThread = [](JavaVM *) {
        const guard hold(lock);
        now.lent -= static_cast<int>(known_threads.erase(std::this_thread::get_id()));
        return JNI_OK;
    };
    return table;
}

}  // namespace

// Takes the log library's place for everything in this program: the program's symbols come first.
extern "C" __attribute__((visibility("default"), format(printf, 3, 4))) int __android_log_print(
    int prio, const char *tag, const char *fmt, ...) {
    char text[512];
    va_list args;
    va_start(args, fmt);
    vsnprintf(text, sizeof text, fmt, args);
    va_end(args);
    const guard hold(lock);
    if (tag == std::string("tavo_jni")) log_lines += std::to_string(prio) + ": " + text + "\n";
    return 1;
}

namespace fake_vm {

JavaVM *machine() {
    static const JNIInvokeInterface_ table = threads();
    static JavaVM vm = {&table};
    return &vm;
}

JNIEnv *environment() {
    static const JNINativeInterface_ table = functions();
    static JNIEnv env = {&table};
    return &env;
}

void reset() {
    const guard hold(lock);
    events.clear();
    log_lines.clear();
    failing.clear();
    watched.clear();
    now.wrong = 0;
    now.pending = false;
    known_threads.insert(std::this_thread::get_id());
}

jobject new_object() {
    const guard hold(lock);
    return new_handle<jobject>();
}

jstring new_string(const std::string &text) {
    const guard hold(lock);
    const auto made = new_handle<jstring>();
    strings[made] = text;
    return made;
}

void fail(const std::string &function, int nth) {
    const guard hold(lock);
    failing = function;
    calls_to_failure = nth;
}

void during(const std::string &function, std::function<void()> run) {
    const guard hold(lock);
    watched = function;
    action = std::move(run);
}

balance held() {
    const guard hold(lock);
    return now;
}

std::vector<event> take_events() {
    const guard hold(lock);
    return std::exchange(events, {});
}

std::string take_log() {
    const guard hold(lock);
    return std::exchange(log_lines, {});
}

}  // namespace fake_vm

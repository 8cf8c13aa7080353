#include "tests/jni/fake_vm.h"

#include <algorithm>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <map>
#include <mutex>
#include <set>
#include <utility>

namespace fake_vm {
namespace {

enum class thread_kind { unknown, own, attached };

struct reference {
    bool global;
    std::vector<float> floats;
    std::string text;
};

const jmethodID kMethod = reinterpret_cast<jmethodID>(uintptr_t{0x500});

// What may be called while an exception is pending.
const std::set<std::string> kAlwaysAllowed = {"DeleteGlobalRef", "DeleteLocalRef",
                                              "ReleaseStringUTFChars", "ExceptionCheck",
                                              "ExceptionClear"};

std::mutex lock;  // guards everything below but the thread's own state
record now;
std::map<uintptr_t, reference> references;  // a handle is never given twice
uintptr_t next_handle = 0x1000;
std::string failing;
int calls_to_failure = 0;
std::function<void()> event_action;

thread_local thread_kind this_thread = thread_kind::unknown;
thread_local bool pending = false;

using guard = std::lock_guard<std::mutex>;

// Each of the following is called with the lock held.

void require(bool holds, const std::string &function, const std::string &what) {
    if (!holds) now.violations += function + ": " + what + "\n";
}

bool succeeds(const std::string &function) {
    return function != failing || --calls_to_failure != 0;
}

uintptr_t handle_of(const void *object) {
    return reinterpret_cast<uintptr_t>(object);
}

// At the beginning of each call. False: it is to fail, and the exception is pending.
bool enter(const std::string &function, const std::vector<jobject> &passed = {}) {
    require(this_thread != thread_kind::unknown, function, "thread not attached");
    require(!pending || kAlwaysAllowed.count(function) != 0, function, "exception pending");
    for (const jobject each : passed) {
        const bool lives = each == nullptr || references.count(handle_of(each)) != 0;
        require(lives, function, "not a live reference");
    }
    if (succeeds(function)) return true;
    pending = true;
    return false;
}

template <typename T>
T add(reference made) {
    references[next_handle] = std::move(made);
    return reinterpret_cast<T>(next_handle++);
}

template <typename T>
T add_local(reference made = {}) {
    ++now.local_references;
    return add<T>(std::move(made));
}

void drop(const char *function, jobject object, bool global) {
    require(references[handle_of(object)].global == global, function, "another kind of reference");
    references.erase(handle_of(object));
    --(global ? now.global_references : now.local_references);
}

// The functions of the two tables.

jclass JNICALL get_object_class(JNIEnv *, jobject object) {
    guard hold(lock);
    return enter("GetObjectClass", {object}) ? add_local<jclass>() : nullptr;
}

jclass JNICALL find_class(JNIEnv *, const char *name) {
    guard hold(lock);
    require(name == std::string("com/kestu/tavo/Tavo"), "FindClass", name);
    return enter("FindClass") ? add_local<jclass>() : nullptr;
}

jmethodID JNICALL get_static_method_id(JNIEnv *, jclass of, const char *name, const char *type) {
    guard hold(lock);
    require(name + std::string(type) == "postEventFromNative(Ljava/lang/Object;III[F)V",
            "GetStaticMethodID", name);
    return enter("GetStaticMethodID", {of}) ? kMethod : nullptr;
}

jobject JNICALL new_global_ref(JNIEnv *, jobject object) {
    guard hold(lock);
    if (!enter("NewGlobalRef", {object})) return nullptr;
    ++now.global_references;
    return add<jobject>({true, {}, {}});
}

void JNICALL delete_global_ref(JNIEnv *, jobject object) {
    guard hold(lock);
    enter("DeleteGlobalRef", {object});
    drop("DeleteGlobalRef", object, true);
}

void JNICALL delete_local_ref(JNIEnv *, jobject object) {
    guard hold(lock);
    enter("DeleteLocalRef", {object});
    drop("DeleteLocalRef", object, false);
}

const char *JNICALL get_string_utf_chars(JNIEnv *, jstring string, jboolean *) {
    guard hold(lock);
    if (!enter("GetStringUTFChars", {string})) return nullptr;
    ++now.held_characters;
    return references[handle_of(string)].text.c_str();
}

void JNICALL release_string_utf_chars(JNIEnv *, jstring string, const char *chars) {
    guard hold(lock);
    enter("ReleaseStringUTFChars", {string});
    require(chars == references[handle_of(string)].text.c_str(), "ReleaseStringUTFChars",
            "not the characters of the string");
    --now.held_characters;
}

jfloatArray JNICALL new_float_array(JNIEnv *, jsize length) {
    guard hold(lock);
    if (!enter("NewFloatArray")) return nullptr;
    return add_local<jfloatArray>({false, std::vector<float>(static_cast<size_t>(length)), {}});
}

void JNICALL set_float_array_region(JNIEnv *, jfloatArray array, jsize start, jsize length,
                                    const jfloat *from) {
    guard hold(lock);
    enter("SetFloatArrayRegion", {array});
    std::vector<float> &floats = references[handle_of(array)].floats;
    const bool whole = start == 0 && length == static_cast<jsize>(floats.size());
    require(whole, "SetFloatArrayRegion", "not the whole array");
    if (whole) std::copy(from, from + length, floats.begin());
}

void JNICALL call_static_void_method(JNIEnv *, jclass of, jmethodID method, va_list args) {
    const char *const name = "CallStaticVoidMethod";
    std::unique_lock<std::mutex> hold(lock);
    event got = {};
    got.object = va_arg(args, jobject);
    got.what = va_arg(args, jint);
    got.arg1 = va_arg(args, jint);
    got.arg2 = va_arg(args, jint);
    const jobject array = va_arg(args, jobject);
    got.has_beats = array != nullptr;
    if (got.has_beats) got.beats = references[handle_of(array)].floats;
    now.events.push_back(got);
    const bool throws = !enter(name, {of, got.object, array});
    require(references[handle_of(of)].global, name, "a class of another thread's");
    require(method == kMethod, name, "not the method that was looked up");
    const std::function<void()> action = event_action;
    pending = false;  // the method is still running
    hold.unlock();
    if (action) action();
    hold.lock();
    // What the Java method was given stays alive for as long as it runs.
    require(references.count(handle_of(of)) != 0, name, "the class is gone");
    pending = throws;
}

jboolean JNICALL exception_check(JNIEnv *) {
    guard hold(lock);
    enter("ExceptionCheck");
    return pending ? JNI_TRUE : JNI_FALSE;
}

void JNICALL exception_clear(JNIEnv *) {
    guard hold(lock);
    enter("ExceptionClear");
    pending = false;
}

jint JNICALL get_env(JavaVM *, void **env, jint version) {
    guard hold(lock);
    require(version == JNI_VERSION_1_6, "GetEnv", "another version");
    *env = nullptr;
    if (!succeeds("GetEnv")) return JNI_EVERSION;
    if (this_thread == thread_kind::unknown) return JNI_EDETACHED;
    *env = environment();
    return JNI_OK;
}

jint JNICALL attach_current_thread(JavaVM *, void **env, void *) {
    guard hold(lock);
    *env = nullptr;
    if (!succeeds("AttachCurrentThread")) return JNI_ERR;
    require(this_thread == thread_kind::unknown, "AttachCurrentThread", "attached already");
    this_thread = thread_kind::attached;
    ++now.attached_threads;
    *env = environment();
    return JNI_OK;
}

jint JNICALL detach_current_thread(JavaVM *) {
    guard hold(lock);
    require(this_thread == thread_kind::attached, "DetachCurrentThread", "not attached by it");
    require(!pending, "DetachCurrentThread", "exception pending");
    this_thread = thread_kind::unknown;
    --now.attached_threads;
    return JNI_OK;
}

}  // namespace

record seen() {
    guard hold(lock);
    record copy = now;
    copy.exception_pending = pending;
    return copy;
}

std::string take_log() {
    guard hold(lock);
    return std::exchange(now.log, std::string());
}

void reset() {
    guard hold(lock);
    now.events.clear();
    now.violations.clear();
    now.log.clear();
    failing.clear();
    event_action = nullptr;
    this_thread = thread_kind::own;
    pending = false;
}

JavaVM *machine() {
    static const JNIInvokeInterface_ table = [] {
        JNIInvokeInterface_ made = {};
        made.GetEnv = get_env;
        made.AttachCurrentThread = attach_current_thread;
        made.DetachCurrentThread = detach_current_thread;
        return made;
    }();
    static JavaVM vm = {&table};
    return &vm;
}

// What the bridge may call; everything else is null and ends the program.
JNIEnv *environment() {
    static const JNINativeInterface_ table = [] {
        JNINativeInterface_ made = {};
        made.GetObjectClass = get_object_class;
        made.FindClass = find_class;
        made.GetStaticMethodID = get_static_method_id;
        made.NewGlobalRef = new_global_ref;
        made.DeleteGlobalRef = delete_global_ref;
        made.DeleteLocalRef = delete_local_ref;
        made.GetStringUTFChars = get_string_utf_chars;
        made.ReleaseStringUTFChars = release_string_utf_chars;
        made.NewFloatArray = new_float_array;
        made.SetFloatArrayRegion = set_float_array_region;
        made.CallStaticVoidMethodV = call_static_void_method;
        made.ExceptionCheck = exception_check;
        made.ExceptionClear = exception_clear;
        return made;
    }();
    static JNIEnv env = {&table};
    if (this_thread == thread_kind::unknown) this_thread = thread_kind::own;
    return &env;
}

jobject new_object() {
    guard hold(lock);
    return add<jobject>({});
}

jstring new_string(const std::string &text) {
    guard hold(lock);
    return add<jstring>({false, {}, text});
}

void fail(const std::string &function, int nth) {
    guard hold(lock);
    failing = function;
    calls_to_failure = nth;
}

void on_event(std::function<void()> action) {
    guard hold(lock);
    event_action = std::move(action);
}

}  // namespace fake_vm

// Takes the log library's place for everything in this program: the program's symbols come first.
extern "C" __attribute__((visibility("default"), format(printf, 3, 4))) int __android_log_print(
    int prio, const char *tag, const char *fmt, ...) {
    char text[512];
    va_list args;
    va_start(args, fmt);
    vsnprintf(text, sizeof(text), fmt, args);
    va_end(args);
    std::lock_guard<std::mutex> hold(fake_vm::lock);
    if (tag == std::string("tavo_jni")) {
        fake_vm::now.log += std::to_string(prio) + ": " + text + "\n";
    }
    return 1;
}

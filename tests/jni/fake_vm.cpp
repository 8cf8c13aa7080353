#include "tests/jni/fake_vm.h"

#include <algorithm>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <iterator>
#include <map>
#include <mutex>
#include <set>

namespace fake_vm {
namespace {

enum class thread_kind { unknown, own, attached };

enum class ref_kind { local, global };

struct reference {
    ref_kind of;
    bool given;  // made by the test, not by the code under test
    std::vector<float> floats;
    std::string text;
};

std::mutex lock;  // guards everything below but the thread's own state
std::map<uintptr_t, reference> references;
uintptr_t next_handle = 0x1000;
std::map<std::string, int> failing;  // calls left until the failing one
std::vector<std::string> call_list;
std::vector<event> event_list;
std::vector<std::string> violation_list;
std::vector<std::string> log_list;
std::set<std::string *> characters;
std::function<void()> event_action;
int attached = 0;

thread_local thread_kind this_thread = thread_kind::unknown;
thread_local bool pending = false;

const JNINativeInterface_ *functions();
const JNIInvokeInterface_ *invoke_functions();
JNIEnv env_of_all = {};
JavaVM the_machine = {};

// Each of the following is called with the lock held.

bool fails(const char *function) {
    const auto found = failing.find(function);
    if (found == failing.end() || --found->second != 0) return false;
    failing.erase(found);
    return true;
}

void violation(const std::string &function, const char *what) {
    violation_list.push_back(function + ": " + what);
}

uintptr_t add(ref_kind of, bool given = false) {
    references[next_handle] = {of, given, {}, {}};
    return next_handle++;
}

reference *find(const char *function, const void *handle) {
    const auto found = references.find(reinterpret_cast<uintptr_t>(handle));
    if (found != references.end()) return &found->second;
    violation(function, "not a live reference");
    return nullptr;
}

void drop(const char *function, const void *handle, ref_kind of) {
    const reference *found = find(function, handle);
    if (found == nullptr) return;
    if (found->of != of) violation(function, "the wrong kind of reference");
    references.erase(reinterpret_cast<uintptr_t>(handle));
}

void enter(const char *function, bool exception_allowed = false) {
    call_list.push_back(function);
    if (this_thread == thread_kind::unknown) violation(function, "thread not attached");
    if (pending && !exception_allowed) violation(function, "exception pending");
}

// A new local reference, or null with an exception pending where the call is to fail.
template <typename T>
T give(const char *function) {
    if (!fails(function)) return reinterpret_cast<T>(add(ref_kind::local));
    pending = true;
    return nullptr;
}

using guard = std::lock_guard<std::mutex>;

jclass JNICALL get_object_class(JNIEnv *, jobject object) {
    guard hold(lock);
    enter("GetObjectClass");
    find("GetObjectClass", object);
    return give<jclass>("GetObjectClass");
}

jclass JNICALL find_class(JNIEnv *, const char *name) {
    guard hold(lock);
    enter("FindClass");
    if (std::string(name) != "com/kestu/tavo/Tavo") violation("FindClass", name);
    return give<jclass>("FindClass");
}

jmethodID JNICALL get_static_method_id(JNIEnv *, jclass of, const char *name, const char *type) {
    guard hold(lock);
    enter("GetStaticMethodID");
    find("GetStaticMethodID", of);
    if (std::string(name) + type != "postEventFromNative(Ljava/lang/Object;III[F)V") {
        violation("GetStaticMethodID", name);
    }
    if (!fails("GetStaticMethodID")) return reinterpret_cast<jmethodID>(uintptr_t{0x500});
    pending = true;
    return nullptr;
}

jobject JNICALL new_global_ref(JNIEnv *, jobject object) {
    guard hold(lock);
    enter("NewGlobalRef");
    find("NewGlobalRef", object);
    if (!fails("NewGlobalRef")) return reinterpret_cast<jobject>(add(ref_kind::global));
    pending = true;
    return nullptr;
}

void JNICALL delete_global_ref(JNIEnv *, jobject object) {
    guard hold(lock);
    enter("DeleteGlobalRef", true);
    drop("DeleteGlobalRef", object, ref_kind::global);
}

void JNICALL delete_local_ref(JNIEnv *, jobject object) {
    guard hold(lock);
    enter("DeleteLocalRef", true);
    drop("DeleteLocalRef", object, ref_kind::local);
}

const char *JNICALL get_string_utf_chars(JNIEnv *, jstring string, jboolean *is_copy) {
    guard hold(lock);
    enter("GetStringUTFChars");
    const reference *found = find("GetStringUTFChars", string);
    if (found == nullptr || fails("GetStringUTFChars")) {
        pending = true;
        return nullptr;
    }
    if (is_copy != nullptr) *is_copy = JNI_TRUE;
    return (*characters.insert(new std::string(found->text)).first)->c_str();
}

void JNICALL release_string_utf_chars(JNIEnv *, jstring string, const char *chars) {
    guard hold(lock);
    enter("ReleaseStringUTFChars", true);
    find("ReleaseStringUTFChars", string);
    for (std::string *text : characters) {
        if (text->c_str() != chars) continue;
        characters.erase(text);
        delete text;
        return;
    }
    violation("ReleaseStringUTFChars", "not characters of a string");
}

jfloatArray JNICALL new_float_array(JNIEnv *, jsize length) {
    guard hold(lock);
    enter("NewFloatArray");
    const jfloatArray array = give<jfloatArray>("NewFloatArray");
    if (array != nullptr) {
        find("NewFloatArray", array)->floats.resize(static_cast<size_t>(length));
    }
    return array;
}

void JNICALL set_float_array_region(JNIEnv *, jfloatArray array, jsize start, jsize length,
                                    const jfloat *from) {
    guard hold(lock);
    enter("SetFloatArrayRegion");
    reference *found = find("SetFloatArrayRegion", array);
    if (found == nullptr) return;
    if (start < 0 || length < 0 ||
        static_cast<size_t>(start) + static_cast<size_t>(length) > found->floats.size()) {
        violation("SetFloatArrayRegion", "outside the array");
        return;
    }
    std::copy(from, from + length, found->floats.begin() + start);
}

void JNICALL call_static_void_method(JNIEnv *, jclass of, jmethodID method, va_list args) {
    std::function<void()> action;
    bool throws = false;
    {
        guard hold(lock);
        enter("CallStaticVoidMethod");
        const reference *found = find("CallStaticVoidMethod", of);
        if (found != nullptr && found->of != ref_kind::global) {
            violation("CallStaticVoidMethod", "a class of another thread's");
        }
        if (method != reinterpret_cast<jmethodID>(uintptr_t{0x500})) {
            violation("CallStaticVoidMethod", "not the method that was looked up");
        }
        event got = {};
        got.object = va_arg(args, jobject);
        if (got.object != nullptr) find("CallStaticVoidMethod", got.object);
        got.what = va_arg(args, jint);
        got.arg1 = va_arg(args, jint);
        got.arg2 = va_arg(args, jint);
        const jobject array = va_arg(args, jobject);
        got.has_beats = array != nullptr;
        if (got.has_beats) {
            const reference *beats = find("CallStaticVoidMethod", array);
            if (beats != nullptr) got.beats = beats->floats;
        }
        got.on_attached_thread = this_thread == thread_kind::attached;
        event_list.push_back(got);
        throws = fails("CallStaticVoidMethod");
        action = event_action;
    }
    if (action) action();
    guard hold(lock);
    // What the Java method was given stays alive for as long as it runs.
    find("CallStaticVoidMethod", of);
    pending = throws;
}

jboolean JNICALL exception_check(JNIEnv *) {
    guard hold(lock);
    enter("ExceptionCheck", true);
    return pending ? JNI_TRUE : JNI_FALSE;
}

void JNICALL exception_clear(JNIEnv *) {
    guard hold(lock);
    enter("ExceptionClear", true);
    pending = false;
}

jint JNICALL get_env(JavaVM *, void **env, jint version) {
    guard hold(lock);
    call_list.push_back("GetEnv");
    *env = nullptr;
    if (version != JNI_VERSION_1_6) violation("GetEnv", "another version");
    if (fails("GetEnv")) return JNI_EVERSION;
    if (this_thread == thread_kind::unknown) return JNI_EDETACHED;
    *env = &env_of_all;
    return JNI_OK;
}

jint JNICALL attach_current_thread(JavaVM *, void **env, void *) {
    guard hold(lock);
    call_list.push_back("AttachCurrentThread");
    *env = nullptr;
    if (fails("AttachCurrentThread")) return JNI_ERR;
    if (this_thread == thread_kind::unknown) {
        this_thread = thread_kind::attached;
        ++attached;
    }
    *env = &env_of_all;
    return JNI_OK;
}

jint JNICALL detach_current_thread(JavaVM *) {
    guard hold(lock);
    call_list.push_back("DetachCurrentThread");
    if (this_thread != thread_kind::attached)
        violation("DetachCurrentThread", "not attached by it");
    if (pending) violation("DetachCurrentThread", "exception pending");
    this_thread = thread_kind::unknown;
    --attached;
    return JNI_OK;
}

// What the bridge may call; everything else is null and ends the program.
const JNINativeInterface_ *functions() {
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
    return &table;
}

const JNIInvokeInterface_ *invoke_functions() {
    static const JNIInvokeInterface_ table = [] {
        JNIInvokeInterface_ made = {};
        made.GetEnv = get_env;
        made.AttachCurrentThread = attach_current_thread;
        made.DetachCurrentThread = detach_current_thread;
        return made;
    }();
    return &table;
}

int count(ref_kind of) {
    int found = 0;
    for (const auto &[handle, each] : references) found += each.of == of && !each.given;
    return found;
}

}  // namespace

void reset() {
    guard hold(lock);
    env_of_all.functions = functions();
    the_machine.functions = invoke_functions();
    for (auto each = references.begin(); each != references.end();) {
        const bool local = each->second.of == ref_kind::local;
        each = local ? references.erase(each) : std::next(each);
    }
    failing.clear();
    call_list.clear();
    event_list.clear();
    violation_list.clear();
    log_list.clear();
    event_action = nullptr;
    this_thread = thread_kind::own;
    pending = false;
}

JavaVM *machine() {
    return &the_machine;
}

JNIEnv *environment() {
    if (this_thread == thread_kind::unknown) this_thread = thread_kind::own;
    return &env_of_all;
}

jobject new_object() {
    guard hold(lock);
    return reinterpret_cast<jobject>(add(ref_kind::local, true));
}

jstring new_string(const std::string &text) {
    guard hold(lock);
    const uintptr_t handle = add(ref_kind::local, true);
    references[handle].text = text;
    return reinterpret_cast<jstring>(handle);
}

void fail(const std::string &function, int nth) {
    guard hold(lock);
    failing[function] = nth;
}

void on_event(std::function<void()> action) {
    guard hold(lock);
    event_action = std::move(action);
}

record seen() {
    guard hold(lock);
    return {call_list,
            event_list,
            violation_list,
            log_list,
            count(ref_kind::global),
            count(ref_kind::local),
            static_cast<int>(characters.size()),
            attached,
            pending};
}

void forget_calls() {
    guard hold(lock);
    call_list.clear();
}

void forget_log() {
    guard hold(lock);
    log_list.clear();
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
    fake_vm::log_list.push_back(std::to_string(prio) + "/" + tag + ": " + text);
    return 1;
}

#include "jni/tavo_jni.h"

#include <android/log.h>

#include <cstdint>
#include <cstdlib>

extern "C" {
pthread_mutex_t *tavo_jni_mutex = nullptr;
}

namespace {

constexpr char kTag[] = "tavo_jni";
constexpr char kHostClass[] = "com/kestu/tavo/Tavo";
constexpr char kPostEvent[] = "postEventFromNative";
constexpr char kPostEventSignature[] = "(Ljava/lang/Object;III[F)V";

constexpr jint kFailed = -1;  // returned by analyze and deinit

constexpr jint kEventResult = 1;
constexpr jint kEventFailure = 2;

// References stored by native_setup. They are counted, because a later native_setup may replace
// them while a worker thread is posting an event with them.
struct host_refs {
    jclass host_class;  // global reference
    jobject object;     // global reference, or null if the host passed null
    int32_t users;      // 1 for the bridge and 1 per event in progress; guarded by host_mutex
};

pthread_mutex_t host_mutex = PTHREAD_MUTEX_INITIALIZER;
host_refs *current_host = nullptr;  // guarded by host_mutex

// tavo_jni_mutex points here after the first init. The mutex is static so that its creation cannot
// fail.
pthread_mutex_t lifecycle_mutex = PTHREAD_MUTEX_INITIALIZER;

// Pointers that one thread sets and others read without a lock. Atomic access only.
JavaVM *java_vm = nullptr;
jmethodID post_event = nullptr;
TAVO_CTX *instance = nullptr;

TAVO_PARAM init_param = {};  // guarded by tavo_jni_mutex; path is null outside tavo_init

// The thread that is posting an event, or zero. A deinit on that thread must not wait for the lock:
// another deinit may hold the lock while it joins the posting thread. Atomic access only.
pthread_t posting_thread = {};

template <typename T>
T *load_pointer(T *const *pointer) {
    return __atomic_load_n(pointer, __ATOMIC_ACQUIRE);
}

template <typename T>
void store_pointer(T **pointer, T *value) {
    __atomic_store_n(pointer, value, __ATOMIC_RELEASE);
}

void mark_posting(pthread_t thread) {
    __atomic_store_n(&posting_thread, thread, __ATOMIC_RELEASE);
}

bool is_posting() {
    const pthread_t thread = __atomic_load_n(&posting_thread, __ATOMIC_ACQUIRE);
    return pthread_equal(thread, pthread_self()) != 0;
}

long handle_value(const TAVO_CTX *ctx) {
    return static_cast<long>(reinterpret_cast<intptr_t>(ctx));
}

// ---- the lock of init and deinit ----

// Creates the lock on first use and locks it. If two threads race to create it, both get the same
// lock.
pthread_mutex_t *lock_for_init() {
    pthread_mutex_t *mutex = nullptr;
    const bool created = __atomic_compare_exchange_n(&tavo_jni_mutex, &mutex, &lifecycle_mutex,
                                                     false, __ATOMIC_ACQ_REL, __ATOMIC_ACQUIRE);
    if (created) mutex = &lifecycle_mutex;
    pthread_mutex_lock(mutex);
    return mutex;
}

// Locks and returns the lock. Before the first init, returns null and locks nothing.
pthread_mutex_t *lock_for_deinit() {
    pthread_mutex_t *mutex = load_pointer(&tavo_jni_mutex);
    if (mutex != nullptr) pthread_mutex_lock(mutex);
    return mutex;
}

void unlock(pthread_mutex_t *mutex) {
    if (mutex != nullptr) pthread_mutex_unlock(mutex);
}

// ---- the host's class and object ----

host_refs *acquire_host() {
    pthread_mutex_lock(&host_mutex);
    host_refs *host = current_host;
    if (host != nullptr) ++host->users;
    pthread_mutex_unlock(&host_mutex);
    return host;
}

void delete_host(JNIEnv *env, host_refs *host) {
    if (host->host_class != nullptr) env->DeleteGlobalRef(host->host_class);
    if (host->object != nullptr) env->DeleteGlobalRef(host->object);
    free(host);
}

// Decrements the use count of the references, and deletes them if it reaches 0.
void release_host(JNIEnv *env, host_refs *host) {
    if (host == nullptr) return;
    pthread_mutex_lock(&host_mutex);
    const bool last = --host->users == 0;
    pthread_mutex_unlock(&host_mutex);
    if (last) delete_host(env, host);
}

// Creates the references with a use count of 1. Returns null if memory runs out.
host_refs *create_host(JNIEnv *env, jclass host_class, jobject obj) {
    auto *host = static_cast<host_refs *>(calloc(1, sizeof(host_refs)));
    if (host == nullptr) return nullptr;
    host->users = 1;
    host->host_class = static_cast<jclass>(env->NewGlobalRef(host_class));
    // If the first call failed, an exception is pending, and NewGlobalRef must not be called.
    if (host->host_class != nullptr && obj != nullptr) host->object = env->NewGlobalRef(obj);
    if (host->host_class == nullptr || (obj != nullptr && host->object == nullptr)) {
        delete_host(env, host);
        return nullptr;
    }
    return host;
}

// ---- init ----

// Looks up the event method in the class and stores it. Returns null, with an exception pending, if
// the class has no such method.
jmethodID find_post_event(JNIEnv *env, jclass host_class) {
    jmethodID method = env->GetStaticMethodID(host_class, kPostEvent, kPostEventSignature);
    if (method != nullptr) store_pointer(&post_event, method);
    return method;
}

// Stores the event method of the host's class. Returns false, with the exception cleared, if the
// class or the method is missing.
bool look_up_host(JNIEnv *env) {
    jclass host_class = env->FindClass(kHostClass);
    const bool found = host_class != nullptr && find_post_event(env, host_class) != nullptr;
    if (!found) env->ExceptionClear();
    if (host_class != nullptr) env->DeleteLocalRef(host_class);
    return found;
}

// Opens an instance. Called with the lock held. The path is read only during this call.
TAVO_CTX *create_instance(const char *path, jint mode, int32_t *err) {
    init_param.path = path;
    init_param.mode = mode;
    TAVO_CTX *ctx = tavo_init(&init_param, err);
    init_param.path = nullptr;
    return ctx;
}

// Connects a new instance to the host. Called with the lock held. Stores the handle last, because
// analyze takes no lock and may use the handle at once.
jint adopt_instance(JNIEnv *env, TAVO_CTX *ctx) {
    if (!look_up_host(env)) {
        tavo_deinit(ctx);
        return TAVO_ERR_HANDLE;
    }
    tavo_setcallback(ctx, tavocallback);
    store_pointer(&instance, ctx);
    return TAVO_OK;
}

jint already_opened() {
    __android_log_print(ANDROID_LOG_ERROR, kTag, "tavo_init is failed. already opened. ");
    return TAVO_ERR_BUSY;
}

jint init_failed(jint code) {
    __android_log_print(ANDROID_LOG_ERROR, kTag, "tavo_init is failed. error=%d", code);
    return code;
}

// Implements init. Called with the lock held, or during an event while an instance is open. `chars`
// is the text of `path` or null; this function releases it.
jint init_locked(JNIEnv *env, jstring path, const char *chars, jint mode) {
    const bool is_open = load_pointer(&instance) != nullptr;
    int32_t err = TAVO_ERR_HANDLE;
    TAVO_CTX *ctx = nullptr;
    if (!is_open && chars != nullptr) ctx = create_instance(chars, mode, &err);
    if (chars != nullptr) env->ReleaseStringUTFChars(path, chars);
    if (is_open) return already_opened();
    if (ctx != nullptr) err = adopt_instance(env, ctx);
    if (err != TAVO_OK) return init_failed(err);
    __android_log_print(ANDROID_LOG_VERBOSE, kTag, "tavo_init and setcallback is finished");
    return TAVO_OK;
}

// ---- deinit ----

jint deinit_failed(const TAVO_CTX *ctx, jint code) {
    __android_log_print(ANDROID_LOG_ERROR, kTag, "tavo_deinit(%ld) is failed. error=%d",
                        handle_value(ctx), code);
    return kFailed;
}

jint deinit_locked() {
    TAVO_CTX *ctx = load_pointer(&instance);
    if (ctx == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "tavo_deinit() is failed. no instance");
        return 0;
    }
    const int32_t result = tavo_deinit(ctx);
    if (result != TAVO_OK) return deinit_failed(ctx, result);
    __android_log_print(ANDROID_LOG_VERBOSE, kTag, "tavo_deinit(%ld) is finished successfully",
                        handle_value(ctx));
    store_pointer(&instance, static_cast<TAVO_CTX *>(nullptr));
    return 0;
}

// ---- events ----

// AttachCurrentThread has different parameter types in the headers of the JDK and the NDK.
template <typename Vm, typename Env>
jint attach_thread(Vm *vm, jint (Vm::*attach)(Env **, void *), JNIEnv **env) {
    Env *attached = nullptr;
    const jint result = (vm->*attach)(&attached, nullptr);
    *env = static_cast<JNIEnv *>(attached);
    return result;
}

// Attaches this thread if necessary. Returns its environment, or null on failure.
JNIEnv *environment(JavaVM *vm, bool *attached_here) {
    void *current = nullptr;
    if (vm->GetEnv(&current, JNI_VERSION_1_6) == JNI_OK) return static_cast<JNIEnv *>(current);
    JNIEnv *env = nullptr;
    *attached_here = attach_thread(vm, &JavaVM::AttachCurrentThread, &env) == JNI_OK;
    return *attached_here ? env : nullptr;
}

void notification_failed(JNIEnv *env) {
    __android_log_print(ANDROID_LOG_ERROR, kTag, "An exception occurred while notifying an event.");
    env->ExceptionClear();
}

// Copies the beats to a Java array and returns a local reference to it. Returns null, with the
// exception cleared, if the virtual machine is out of memory.
jfloatArray copy_beats(JNIEnv *env, const TAVO_INFO *info) {
    jfloatArray beats = env->NewFloatArray(info->beat_count);
    if (beats == nullptr) {
        notification_failed(env);
        return nullptr;
    }
    env->SetFloatArrayRegion(beats, 0, info->beat_count, info->beat_times);
    return beats;
}

void post(JNIEnv *env, const host_refs *host, jmethodID method, const TAVO_INFO *info) {
    const bool has_beats = info->status == 0 && info->beat_count >= 1;
    jfloatArray beats = has_beats ? copy_beats(env, info) : nullptr;
    const bool failed = info->status != 0 || (has_beats && beats == nullptr);
    const jint event = failed ? kEventFailure : kEventResult;
    const jint count = beats != nullptr ? info->beat_count : 0;

    env->CallStaticVoidMethod(host->host_class, method, host->object, event, info->hl_pos, count,
                              beats);
    // The thread may have been attached earlier and may stay attached, so delete the local
    // reference.
    if (beats != nullptr) env->DeleteLocalRef(beats);
    if (env->ExceptionCheck() == JNI_TRUE) notification_failed(env);
}

}  // namespace

extern "C" {

JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM *vm, void * /*reserved*/) {
    store_pointer(&java_vm, vm);
    void *env = nullptr;
    return vm->GetEnv(&env, JNI_VERSION_1_6) == JNI_OK ? JNI_VERSION_1_6 : JNI_ERR;
}

JNIEXPORT void JNICALL Java_com_kestu_tavo_Tavo_native_1setup(JNIEnv *env, jobject thiz,
                                                              jobject obj) {
    jclass host_class = env->GetObjectClass(thiz);
    if (host_class == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "Can't find com/kestu/tavo/Tavo");
        env->ExceptionClear();
        return;
    }
    host_refs *host = create_host(env, host_class, obj);
    env->DeleteLocalRef(host_class);
    if (host == nullptr) {  // out of memory: keep the earlier references
        env->ExceptionClear();
        return;
    }
    pthread_mutex_lock(&host_mutex);
    host_refs *replaced = current_host;
    current_host = host;
    pthread_mutex_unlock(&host_mutex);
    release_host(env, replaced);
}

JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_init(JNIEnv *env, jobject /*thiz*/, jstring path,
                                                     jint mode) {
    const char *chars = path != nullptr ? env->GetStringUTFChars(path, nullptr) : nullptr;
    if (chars == nullptr) env->ExceptionClear();
    // During an event, a deinit that waits for this thread may hold the lock.
    const bool takes_lock = !is_posting() || load_pointer(&instance) == nullptr;
    pthread_mutex_t *mutex = takes_lock ? lock_for_init() : nullptr;
    const jint result = init_locked(env, path, chars, mode);
    unlock(mutex);
    return result;
}

JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_analyze(JNIEnv * /*env*/, jobject /*thiz*/,
                                                        jint hl_param, jint max_beats,
                                                        jint beat_param2) {
    TAVO_CTX *ctx = load_pointer(&instance);
    if (ctx == nullptr) return 0;
    const int32_t result = tavo_analyze(ctx, hl_param, max_beats, beat_param2);
    if (result < 0) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "tavo_analyze() is failed. error=%d", result);
        return kFailed;
    }
    __android_log_print(ANDROID_LOG_VERBOSE, kTag, "tavo_analyze (id:%ld) - start",
                        handle_value(ctx));
    return result == TAVO_OK ? 0 : kFailed;
}

JNIEXPORT jint JNICALL Java_com_kestu_tavo_Tavo_deinit(JNIEnv * /*env*/, jobject /*thiz*/) {
    TAVO_CTX *posting_ctx = is_posting() ? load_pointer(&instance) : nullptr;
    if (posting_ctx != nullptr) return deinit_failed(posting_ctx, TAVO_ERR_HANDLE);
    pthread_mutex_t *mutex = lock_for_deinit();
    const jint result = deinit_locked();
    unlock(mutex);
    return result;
}

JNIEXPORT void JNICALL Java_com_kestu_tavo_Tavo_disableClickTrack(JNIEnv * /*env*/,
                                                                  jclass /*host*/) {
    fnamedec = "";
}

JNIEXPORT jboolean JNICALL Java_com_kestu_tavo_Tavo_isComplete(JNIEnv * /*env*/, jobject /*thiz*/) {
    return tavo_is_complete(load_pointer(&instance)) != 0 ? JNI_TRUE : JNI_FALSE;
}

JNIEXPORT jstring JNICALL Java_com_kestu_tavo_Tavo_reason(JNIEnv *env, jclass /*host*/,
                                                          jstring path) {
    const char *chars = path != nullptr ? env->GetStringUTFChars(path, nullptr) : nullptr;
    if (path != nullptr && chars == nullptr) return nullptr;  // an exception is pending
    const int32_t code = tavo_probe(chars, nullptr);
    if (chars != nullptr) env->ReleaseStringUTFChars(path, chars);
    return code != TAVO_OK ? env->NewStringUTF(tavo_error_text(code)) : nullptr;
}

void tavocallback(TAVO_INFO *info) {
    JavaVM *vm = load_pointer(&java_vm);
    bool attached_here = false;
    JNIEnv *env = vm != nullptr ? environment(vm, &attached_here) : nullptr;
    if (env == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, kTag,
                            "Failed to get the environment using AttachCurrentThread()");
        return;
    }
    host_refs *host = acquire_host();
    jmethodID method = load_pointer(&post_event);
    if (method == nullptr && host != nullptr) method = find_post_event(env, host->host_class);
    if (method != nullptr && host != nullptr) {
        mark_posting(pthread_self());
        post(env, host, method, info);
        mark_posting({});
    } else {  // the class or its event method is missing
        notification_failed(env);
    }
    release_host(env, host);
    // A thread that ends while attached aborts Android's runtime and keeps a desktop runtime from
    // exiting.
    if (attached_here) vm->DetachCurrentThread();
}
}

#include <gtest/gtest.h>

#include <algorithm>

#include "jni/tavo_jni.h"
#include "tests/jni/fake_vm.h"

namespace {

using fake_vm::machine_state;
using numbers = std::vector<jint>;  // of an event

const std::string kOpened = "2: tavo_init and setcallback is finished\n";
const std::string kBusyLog = "6: tavo_init is failed. already opened. \n";
const std::string kUnusable = "6: tavo_init is failed. error=-4\n";
const std::string kNoInstance = "6: tavo_deinit() is failed. no instance\n";
const std::string kNoHost = "6: Can't find com/kestu/tavo/Tavo\n";
const std::string kNotNotified = "6: An exception occurred while notifying an event.\n";
const std::string kNotAttached = "6: Failed to get the environment using AttachCurrentThread()\n";

// The only Java object. The machine counts the references to it.
const auto object = reinterpret_cast<jobject>(&fake_vm::machine);

void setup(jobject obj = object) {
    Java_com_kestu_tavo_Tavo_native_1setup(&fake_vm::env, object, obj);
}
jint init(const char *path = SHORT_SONGS "/brief.wav") {
    const auto string = reinterpret_cast<jstring>(const_cast<char *>(path));
    return Java_com_kestu_tavo_Tavo_init(&fake_vm::env, object, string, TAVO_MODE_HIGHLIGHT);
}
jint analyze() {
    return Java_com_kestu_tavo_Tavo_analyze(&fake_vm::env, object, 0, 0, 0);
}
jint deinit() {
    return Java_com_kestu_tavo_Tavo_deinit(&fake_vm::env, object);
}

void call_back_on_a_thread(TAVO_INFO info) {
    std::thread([&info] { tavocallback(&info); }).join();
}

void expect_references(int global_references) {
    EXPECT_EQ(fake_vm::global_references, global_references);
    EXPECT_EQ(fake_vm::unreturned, 0);
    EXPECT_EQ(fake_vm::misplaced_calls, 0);
    EXPECT_FALSE(fake_vm::pending);
}

struct Jni : testing::Test {
    void SetUp() override {
        fnamedec = "";
        machine_state = {};
        ASSERT_EQ(JNI_OnLoad(&fake_vm::machine, nullptr), JNI_VERSION_1_6);
        setup();
    }
    void TearDown() override {
        EXPECT_EQ(deinit(), 0);
        expect_references(2);  // to the class and to the object that setup received
    }
};

// This must be the first test in the file, because it needs a bridge without any state.
TEST(JniFirstCalls, EachCreatesWhatItNeeds) {
    TAVO_INFO info = {};
    tavocallback(&info);  // no virtual machine
    machine_state.failing = "GetEnv";
    EXPECT_EQ(JNI_OnLoad(&fake_vm::machine, nullptr), -1);
    ASSERT_EQ(JNI_OnLoad(&fake_vm::machine, nullptr), 0x10006);

    // Of three callbacks, the first finds no class, the second no method, and the third finds both.
    call_back_on_a_thread(info);
    EXPECT_EQ(machine_state.log_lines, kNotAttached + kNotNotified);
    machine_state = {"GetStaticMethodID"};
    setup();
    call_back_on_a_thread(info);
    EXPECT_TRUE(machine_state.events.empty());
    tavocallback(&info);
    EXPECT_EQ(machine_state.events.size(), 1u);

    EXPECT_EQ(numbers({analyze(), deinit()}), numbers({0, 0}));
    EXPECT_EQ(machine_state.log_lines, kNotNotified + kNoInstance);
    EXPECT_EQ(tavo_jni_mutex, nullptr);

    // init locks an existing lock after it reads the path, and frees the path before it unlocks.
    pthread_mutex_t existing_lock = PTHREAD_MUTEX_INITIALIZER;
    tavo_jni_mutex = &existing_lock;
    std::vector<int> trials;
    const auto try_lock = [&] {
        trials.push_back(pthread_mutex_trylock(&existing_lock));
        if (trials.back() == 0) pthread_mutex_unlock(&existing_lock);
    };
    machine_state = {"", 0, "GetStringUTFChars", try_lock};
    EXPECT_EQ(init("/nowhere.wav"), -4);
    machine_state.watched = "ReleaseStringUTFChars";
    EXPECT_EQ(init("/nowhere.wav"), -4);
    EXPECT_EQ(trials, (std::vector<int>{0, EBUSY}));
    tavo_jni_mutex = nullptr;
    EXPECT_EQ(init(nullptr), -4);
    EXPECT_NE(tavo_jni_mutex, nullptr);
    EXPECT_EQ(machine_state.log_lines, kUnusable + kUnusable + kUnusable);
    expect_references(2);
}

// Calls inside an event fail at once, even while deinit holds the lock on another thread.
TEST_F(Jni, JobIsOpenedStartedAndEndedOnce) {
    numbers inside;
    machine_state.watched = "CallStaticVoidMethod";
    machine_state.action = [&inside] {
        while (pthread_mutex_trylock(tavo_jni_mutex) == 0) pthread_mutex_unlock(tavo_jni_mutex);
        inside = {analyze(), deinit(), init(nullptr)};
    };
    EXPECT_EQ(numbers({init(), init(), init(nullptr), analyze()}), numbers({0, -1, -1, 0}));
    EXPECT_EQ(numbers({deinit(), deinit(), analyze()}), numbers({0, 0, 0}));
    EXPECT_EQ(inside, numbers({-1, -1, -1}));
    EXPECT_EQ(machine_state.events.size(), 1u);

    const size_t at = machine_state.log_lines.find("(id:") + 4;
    const std::string id = std::to_string(std::stol(machine_state.log_lines.substr(at)));
    EXPECT_EQ(machine_state.log_lines, kOpened + kBusyLog + kBusyLog + "2: tavo_analyze (id:" + id +
                                           ") - start\n6: tavo_analyze() is failed. error=-5\n" +
                                           "6: tavo_deinit(" + id + ") is failed. error=-4\n" +
                                           kBusyLog + "2: tavo_deinit(" + id +
                                           ") is finished successfully\n" + kNoInstance);
}

// A failed setup keeps the earlier references, a failed init leaves no instance, and a failure
// inside an event is only logged.
TEST_F(Jni, OneEventCarriesTheResultWhateverFails) {
    std::vector<float> times(120);
    for (size_t i = 0; i < times.size(); ++i) times[i] = 500.0f * static_cast<float>(i) + 0.25f;
    const TAVO_INFO both = {29980, 120, times.data(), 0};
    const numbers none = {}, result = {1, 29980, 120};
    const struct {
        const char *failing;
        int nth;
        TAVO_INFO info;
        std::string log;
        numbers event;
    } cases[] = {
        {"", 0, both, kOpened, result},
        {"", 0, {29980, 1, times.data(), 0}, kOpened, {1, 29980, 1}},
        {"", 0, {62000, 0, nullptr, 0}, kOpened, {1, 62000, 0}},
        {"", 0, {29980, 0, nullptr, -1}, kOpened, {2, 29980, 0}},
        {"", 0, {0, 120, times.data(), -1}, kOpened, {2, 0, 0}},
        {"GetObjectClass", 1, both, kNoHost + kOpened, result},
        {"NewGlobalRef", 1, both, kOpened, result},
        {"NewGlobalRef", 2, both, kOpened, result},
        {"GetStringUTFChars", 1, both, kUnusable, none},
        {"FindClass", 1, both, kUnusable, none},
        {"GetStaticMethodID", 1, both, kUnusable, none},
        {"AttachCurrentThread", 1, both, kOpened + kNotAttached, none},
        {"NewFloatArray", 1, both, kOpened + kNotNotified, {2, 29980, 0}},
        {"CallStaticVoidMethod", 1, both, kOpened + kNotNotified, result},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(testing::Message() << each.failing << each.nth << ", " << each.info.hl_pos);
        const bool opens = each.log != kUnusable;
        machine_state = {each.failing, each.nth};
        setup();
        EXPECT_EQ(init(), opens ? 0 : -4);
        if (opens) call_back_on_a_thread(each.info);
        EXPECT_EQ(machine_state.log_lines, each.log);
        expect_references(2);
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(machine_state.log_lines == each.log + kNoInstance, !opens);
        ASSERT_EQ(machine_state.events.size(), each.event.empty() ? 0u : 1u);
        if (machine_state.events.empty()) continue;
        EXPECT_NE(machine_state.events[0].object, nullptr);
        EXPECT_EQ(machine_state.events[0].numbers, each.event);
        const std::vector<float> beats(times.begin(), times.begin() + each.event[2]);
        EXPECT_EQ(machine_state.events[0].beats,
                  beats.empty() ? std::nullopt : std::optional(beats));
    }
}

// The references that an event uses stay valid until it returns, even if setup replaces them.
TEST_F(Jni, RepeatedSetupReplacesTheReferences) {
    ASSERT_EQ(init(), 0);
    TAVO_INFO info = {};
    machine_state.watched = "CallStaticVoidMethod";
    machine_state.action = [] {
        setup();
        EXPECT_EQ(fake_vm::global_references, 4);
    };
    tavocallback(&info);
    expect_references(2);
    machine_state.watched = "";
    tavocallback(&info);
    setup(nullptr);  // events then have no object
    expect_references(1);
    tavocallback(&info);

    ASSERT_EQ(machine_state.events.size(), 3u);
    EXPECT_NE(machine_state.events[0].object, machine_state.events[1].object);
    EXPECT_NE(machine_state.events[1].object, nullptr);
    EXPECT_EQ(machine_state.events[2].object, nullptr);
    setup();
}

TEST_F(Jni, ConcurrentCallsOpenOneInstance) {
    numbers results(4);
    std::vector<std::thread> threads;
    for (jint &result : results) threads.emplace_back([&result] { result = init(); });
    for (std::thread &thread : threads) thread.join();
    std::sort(results.begin(), results.end());
    EXPECT_EQ(results, numbers({-1, -1, -1, 0}));

    std::thread setups([] {
        for (int i = 0; i < 200; ++i) setup();
    });
    for (int i = 0; i < 200; ++i) call_back_on_a_thread({});
    setups.join();
    EXPECT_EQ(machine_state.events.size(), 200u);
}

}  // namespace

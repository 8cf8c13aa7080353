#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <string>
#include <thread>
#include <vector>

#include "jni/tavo_jni.h"
#include "tests/jni/fake_vm.h"
#include "tests/support/song.h"

namespace {

using numbers = std::vector<jint>;  // of an event

constexpr jint kBusy = -1;

const std::string kOpened = "2: tavo_init and setcallback is finished\n";
const std::string kBusyLog = "6: tavo_init is failed. already opened. \n";
const std::string kUnusable = "6: tavo_init is failed. error=-4\n";
const std::string kNoInstance = "6: tavo_deinit() is failed. no instance\n";
const std::string kNoHost = "6: Can't find com/kestu/tavo/Tavo\n";
const std::string kNotNotified = "6: An exception occurred while notifying an event.\n";
const std::string kNotAttached = "6: Failed to get the environment using AttachCurrentThread()\n";

// A song in a file of its own for as long as the tests run.
const std::string &song_path() {
    static const std::string path = [] {
        support::song_spec plan;
        plan.seconds = 2.0;
        const std::string made = testing::TempDir() + "tavo_" + std::to_string(getpid()) + ".wav";
        EXPECT_TRUE(support::write_wav(made, support::make_song(plan)));
        return made;
    }();
    return path;
}

void setup(jobject object = fake_vm::new_object()) {
    Java_com_kestu_tavo_Tavo_native_1setup(&fake_vm::env, fake_vm::new_object(), object);
}
// The fake machine's strings are their characters.
jstring as_string(const char *path) {
    return reinterpret_cast<jstring>(const_cast<char *>(path));
}
jint init(jstring path = as_string(song_path().c_str())) {
    return Java_com_kestu_tavo_Tavo_init(&fake_vm::env, fake_vm::new_object(), path,
                                         TAVO_MODE_HIGHLIGHT);
}
jint analyze() {
    return Java_com_kestu_tavo_Tavo_analyze(&fake_vm::env, fake_vm::new_object(), 0, 0, 0);
}
jint deinit() {
    return Java_com_kestu_tavo_Tavo_deinit(&fake_vm::env, fake_vm::new_object());
}

void call_back_on_a_thread(TAVO_INFO info) {
    std::thread([&info] { tavocallback(&info); }).join();
}

void expect_held(int global_references) {
    const fake_vm::balance &held = fake_vm::now;
    EXPECT_EQ(held.global_references, global_references);
    EXPECT_EQ(held.lent, 0);
    EXPECT_EQ(held.wrong, 0);
    EXPECT_FALSE(held.pending);
}

struct Jni : testing::Test {
    void SetUp() override {
        fnamedec = "";
        fake_vm::reset();
        ASSERT_EQ(JNI_OnLoad(&fake_vm::machine, nullptr), JNI_VERSION_1_6);
        setup();
        fake_vm::take(&fake_vm::log_lines);
    }
    void TearDown() override {
        EXPECT_EQ(deinit(), 0);
        expect_held(2);  // the class and the object that setup was given
    }
    static void TearDownTestSuite() { unlink(song_path().c_str()); }
};

// First in this file: nothing of the bridge exists yet.
TEST(JniFirstCalls, EachIsHarmlessAndMakesWhatItNeeds) {
    fake_vm::reset();
    TAVO_INFO info = {};
    tavocallback(&info);  // no virtual machine
    EXPECT_EQ(fake_vm::take(&fake_vm::log_lines), kNotAttached);
    fake_vm::fail("GetEnv");
    EXPECT_EQ(JNI_OnLoad(&fake_vm::machine, nullptr), -1);
    ASSERT_EQ(JNI_OnLoad(&fake_vm::machine, nullptr), 0x10006);

    // The callback before init: without a host, without its method, and with both.
    tavocallback(&info);
    setup();
    fake_vm::fail("GetStaticMethodID");
    tavocallback(&info);
    EXPECT_EQ(fake_vm::take(&fake_vm::log_lines), kNotNotified + kNotNotified);
    EXPECT_TRUE(fake_vm::take(&fake_vm::events).empty());
    tavocallback(&info);
    EXPECT_EQ(fake_vm::take(&fake_vm::log_lines), "");
    EXPECT_EQ(fake_vm::take(&fake_vm::events).size(), 1u);

    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(fake_vm::take(&fake_vm::log_lines), kNoInstance);
    EXPECT_EQ(tavo_jni_mutex, nullptr);

    // A lock that is there already is used, not replaced.
    pthread_mutex_t *own = new pthread_mutex_t(PTHREAD_MUTEX_INITIALIZER);
    tavo_jni_mutex = own;
    int locked = 0;
    fake_vm::during("GetStringUTFChars", [&] { locked = pthread_mutex_trylock(own); });
    EXPECT_EQ(init(as_string("/nowhere.wav")), -4);
    EXPECT_EQ(locked, EBUSY);
    EXPECT_EQ(tavo_jni_mutex, own);
    tavo_jni_mutex = nullptr;
    delete own;
    EXPECT_EQ(init(nullptr), -4);
    EXPECT_NE(tavo_jni_mutex, nullptr);
    EXPECT_EQ(fake_vm::take(&fake_vm::log_lines), kUnusable + kUnusable);
    expect_held(2);
}

// Inside the event, while a deinit elsewhere holds the lock and waits for it, no call waits.
TEST_F(Jni, AJobIsOpenedStartedAndEndedOnce) {
    std::vector<jint> inside;
    fake_vm::during("CallStaticVoidMethod", [&] {
        while (pthread_mutex_trylock(tavo_jni_mutex) == 0) {
            pthread_mutex_unlock(tavo_jni_mutex);
            std::this_thread::yield();
        }
        inside = {analyze(), deinit(), init(nullptr)};
    });
    EXPECT_EQ(init(), 0);
    EXPECT_EQ(init(), kBusy);
    EXPECT_EQ(init(nullptr), kBusy);
    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(inside, numbers({-1, -1, kBusy}));
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(fake_vm::take(&fake_vm::events).size(), 1u);

    const std::string log = fake_vm::take(&fake_vm::log_lines);
    const size_t at = log.find("(id:") + 4;
    const std::string id = log.substr(at, log.find(')', at) - at);
    EXPECT_EQ(id.find_first_not_of("0123456789"), std::string::npos);
    EXPECT_EQ(log, kOpened + kBusyLog + kBusyLog + "2: tavo_analyze (id:" + id + ") - start\n" +
                       "6: tavo_analyze() is failed. error=-5\n" + "6: tavo_deinit(" + id +
                       ") is failed. error=-4\n" + kBusyLog + "2: tavo_deinit(" + id +
                       ") is finished successfully\n" + kNoInstance);
}

// Lives from setup to deinit in which a call of the machine fails, or none. A failed setup keeps
// the earlier host, a failed init leaves no instance, and what fails in an event is known to the
// log alone.
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
        {"", 0, {62000, 0, nullptr, 0}, kOpened, {1, 62000, 0}},
        {"", 0, {29980, 0, nullptr, -1}, kOpened, {2, 29980, 0}},
        {"", 0, {0, 120, times.data(), -1}, kOpened, {2, 0, 0}},
        {"GetObjectClass", 1, both, kNoHost + kOpened, result},
        {"NewGlobalRef", 1, both, kNoHost + kOpened, result},
        {"NewGlobalRef", 2, both, kNoHost + kOpened, result},
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
        fake_vm::reset();
        fake_vm::fail(each.failing, each.nth);
        setup();
        EXPECT_EQ(init(), opens ? 0 : -4);
        if (opens) call_back_on_a_thread(each.info);
        EXPECT_EQ(fake_vm::take(&fake_vm::log_lines), each.log);
        expect_held(2);
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(fake_vm::take(&fake_vm::log_lines) == kNoInstance, !opens);

        const std::vector<fake_vm::event> events = fake_vm::take(&fake_vm::events);
        ASSERT_EQ(events.size(), each.event.empty() ? 0u : 1u);
        if (events.empty()) continue;
        EXPECT_NE(events[0].object, nullptr);
        EXPECT_EQ(events[0].numbers, each.event);
        EXPECT_EQ(events[0].beats, each.event[2] != 0 ? std::optional(times) : std::nullopt);
    }
}

// From a thread that the machine knows, which stays attached. What an event uses lives on until it
// has returned.
TEST_F(Jni, ARepeatedSetupReplacesItsReferences) {
    ASSERT_EQ(init(), 0);
    TAVO_INFO info = {};
    fake_vm::during("CallStaticVoidMethod", [] { setup(); });
    tavocallback(&info);
    expect_held(2);
    fake_vm::during("", nullptr);
    tavocallback(&info);
    setup(nullptr);  // a null object is passed on as null
    expect_held(1);
    tavocallback(&info);

    const std::vector<fake_vm::event> events = fake_vm::take(&fake_vm::events);
    ASSERT_EQ(events.size(), 3u);
    EXPECT_NE(events[0].object, events[1].object);
    EXPECT_NE(events[1].object, nullptr);
    EXPECT_EQ(events[2].object, nullptr);
    setup();
}

TEST_F(Jni, ThreadsMayComeTogether) {
    std::vector<jint> results(4);
    std::vector<std::thread> threads;
    for (jint &result : results) {
        threads.emplace_back([&result] { result = init(); });
    }
    for (std::thread &thread : threads) thread.join();
    std::sort(results.begin(), results.end());
    EXPECT_EQ(results, numbers({kBusy, kBusy, kBusy, 0}));

    std::thread setups([] {
        for (int i = 0; i < 200; ++i) setup();
    });
    for (int i = 0; i < 200; ++i) call_back_on_a_thread({});
    setups.join();
    EXPECT_EQ(fake_vm::take(&fake_vm::events).size(), 200u);
}

}  // namespace

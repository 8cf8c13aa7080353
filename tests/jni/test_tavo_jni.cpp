#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <iterator>
#include <regex>
#include <string>
#include <thread>
#include <vector>

#include "jni/tavo_jni.h"
#include "tests/jni/fake_vm.h"
#include "tests/support/song.h"

namespace {

constexpr jint kBusy = -1;

constexpr char kOpened[] = "2: tavo_init and setcallback is finished\n";
constexpr char kBusyLog[] = "6: tavo_init is failed. already opened. \n";
constexpr char kUnusable[] = "6: tavo_init is failed. error=-4\n";
constexpr char kNoInstance[] = "6: tavo_deinit() is failed. no instance\n";
constexpr char kNoHost[] = "6: Can't find com/kestu/tavo/Tavo\n";
constexpr char kNotNotified[] = "6: An exception occurred while notifying an event.\n";
constexpr char kNotAttached[] = "6: Failed to get the environment using AttachCurrentThread()\n";

void setup(jobject object) {
    Java_com_kestu_tavo_Tavo_native_1setup(fake_vm::environment(), fake_vm::new_object(), object);
}
jint init(const std::string &path) {
    return Java_com_kestu_tavo_Tavo_init(fake_vm::environment(), fake_vm::new_object(),
                                         fake_vm::new_string(path), TAVO_MODE_HIGHLIGHT);
}
jint analyze() {
    return Java_com_kestu_tavo_Tavo_analyze(fake_vm::environment(), fake_vm::new_object(), 0, 0, 0);
}
jint deinit() {
    return Java_com_kestu_tavo_Tavo_deinit(fake_vm::environment(), fake_vm::new_object());
}

bool logged(const std::string &pattern) {
    return std::regex_match(fake_vm::take_log(), std::regex(pattern));
}

void call_back_on_a_thread(TAVO_INFO info) {
    std::thread([&info] { tavocallback(&info); }).join();
}

// A song in a file of its own for as long as the tests run.
const std::string &song_path() {
    static const std::string path = [] {
        support::song_spec plan;
        plan.seconds = 20.0;
        plan.loud_at = 6.0;
        plan.tail_at = 16.0;
        std::string made = testing::TempDir() + "tavo_jni_" + std::to_string(getpid()) + ".wav";
        if (!support::write_wav(made, support::make_song(plan))) made.clear();
        return made;
    }();
    return path;
}

void expect_all_given_back() {
    const fake_vm::record seen = fake_vm::seen();
    EXPECT_EQ(seen.violations, "");
    EXPECT_EQ(seen.held_characters, 0);
    EXPECT_EQ(seen.attached_threads, 0);
    EXPECT_EQ(seen.local_references, 0);
    EXPECT_EQ(seen.global_references, 2);  // the class and the object that setup was given
    EXPECT_FALSE(seen.exception_pending);
}

struct Jni : testing::Test {
    void SetUp() override {
        fnamedec = "";
        fake_vm::reset();
        ASSERT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), JNI_VERSION_1_6);
        setup(fake_vm::new_object());
        ASSERT_FALSE(song_path().empty());
        fake_vm::take_log();
    }
    void TearDown() override {
        EXPECT_EQ(deinit(), 0);
        expect_all_given_back();
    }
    static void TearDownTestSuite() { unlink(song_path().c_str()); }
};

// First in this file: nothing of the bridge exists yet.
TEST(JniBeforeSetup, EveryCallIsHarmless) {
    fake_vm::reset();
    TAVO_INFO info = {};
    tavocallback(&info);  // no virtual machine
    EXPECT_EQ(fake_vm::take_log(), kNotAttached);

    fake_vm::fail("GetEnv");
    EXPECT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), -1);
    ASSERT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), 0x10006);
    tavocallback(&info);  // no host
    EXPECT_EQ(fake_vm::take_log(), kNotNotified);
    EXPECT_TRUE(fake_vm::seen().events.empty());

    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(fake_vm::take_log(), kNoInstance);
    EXPECT_EQ(tavo_jni_mutex, nullptr);
    EXPECT_EQ(fake_vm::seen().violations, "");
}

TEST_F(Jni, LifecycleAnswersAndLogsAsItIs) {
    ASSERT_EQ(init(song_path()), 0);
    EXPECT_EQ(fake_vm::take_log(), kOpened);
    EXPECT_NE(tavo_jni_mutex, nullptr);
    EXPECT_EQ(init(song_path()), kBusy);
    EXPECT_EQ(fake_vm::take_log(), kBusyLog);

    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(analyze(), -1);
    EXPECT_EQ(deinit(), 0);
    EXPECT_TRUE(
        logged("2: tavo_analyze \\(id:(\\d+)\\) - start\n"
               "6: tavo_analyze\\(\\) is failed. error=-5\n"
               "2: tavo_deinit\\(\\1\\) is finished successfully\n"));
    EXPECT_EQ(fake_vm::seen().events.size(), 1u);

    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(fake_vm::take_log(), kNoInstance);
    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(fake_vm::seen().events.size(), 1u);
}

TEST_F(Jni, AFileThatCannotBeUsedLeavesNoInstance) {
    for (const std::string &path :
         {std::string("/nowhere/no such file.wav"), std::string(512, 'x')}) {
        EXPECT_EQ(init(path), -4);
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(fake_vm::take_log(), std::string(kUnusable) + kNoInstance);
    }
    EXPECT_EQ(
        Java_com_kestu_tavo_Tavo_init(fake_vm::environment(), fake_vm::new_object(), nullptr, 0),
        -4);
    EXPECT_EQ(fake_vm::take_log(), kUnusable);
}

// In a life from setup to deinit. A failed setup keeps the earlier host, a failed init leaves no
// instance, and a failed event is followed by the end of the thread's visit.
TEST_F(Jni, EveryCallOfTheMachineCanFail) {
    float times[] = {1.0f, 2.0f};
    struct {
        const char *function;
        int nth;
        jint opened;
        std::string log;   // without that of a deinit behind
        jint what, beats;  // of the event; 0 for none
    } const cases[] = {
        {"GetObjectClass", 1, 0, std::string(kNoHost) + kOpened, 1, 2},
        {"NewGlobalRef", 1, 0, std::string(kNoHost) + kOpened, 1, 2},
        {"NewGlobalRef", 2, 0, std::string(kNoHost) + kOpened, 1, 2},
        {"GetStringUTFChars", 1, -4, kUnusable, 0, 0},
        {"FindClass", 1, -4, kUnusable, 0, 0},
        {"GetStaticMethodID", 1, -4, kUnusable, 0, 0},
        {"AttachCurrentThread", 1, 0, std::string(kOpened) + kNotAttached, 0, 0},
        {"NewFloatArray", 1, 0, std::string(kOpened) + kNotNotified, 2, 0},
        {"CallStaticVoidMethod", 1, 0, std::string(kOpened) + kNotNotified, 1, 2},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.function + std::to_string(each.nth));
        fake_vm::reset();
        fake_vm::fail(each.function, each.nth);
        setup(fake_vm::new_object());
        EXPECT_EQ(init(song_path()), each.opened);
        if (each.opened == 0) call_back_on_a_thread({7000, 2, times, 0});
        EXPECT_EQ(fake_vm::take_log(), each.log);
        expect_all_given_back();
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(fake_vm::take_log() == kNoInstance, each.opened != 0);

        const std::vector<fake_vm::event> events = fake_vm::seen().events;
        ASSERT_EQ(events.size(), each.what != 0 ? 1u : 0u);
        if (events.empty()) continue;
        EXPECT_EQ(events[0].what, each.what);
        EXPECT_EQ(events[0].arg1, 7000);
        EXPECT_EQ(events[0].arg2, each.beats);
        EXPECT_EQ(events[0].has_beats, each.beats != 0);
    }
}

TEST_F(Jni, EventsCarryTheResult) {
    ASSERT_EQ(init(song_path()), 0);
    std::vector<float> times(120);
    for (size_t i = 0; i < times.size(); ++i) times[i] = 500.0f * static_cast<float>(i) + 0.25f;
    struct {
        TAVO_INFO info;
        jint what, arg1, arg2;
        bool beats;
    } const cases[] = {
        {{62000, 0, nullptr, 0}, 1, 62000, 0, false},
        {{0, 120, times.data(), 0}, 1, 0, 120, true},
        {{29980, 120, times.data(), 0}, 1, 29980, 120, true},
        {{29980, 0, nullptr, -1}, 2, 29980, 0, false},
        {{0, 0, nullptr, -1}, 2, 0, 0, false},
        {{0, 120, times.data(), -1}, 2, 0, 0, false},
    };
    for (const auto &each : cases) {
        for (const bool own_thread : {true, false}) {
            TAVO_INFO info = each.info;
            own_thread ? tavocallback(&info) : call_back_on_a_thread(info);
            const fake_vm::event got = fake_vm::seen().events.back();
            EXPECT_NE(got.object, nullptr);
            EXPECT_EQ(got.what, each.what);
            EXPECT_EQ(got.arg1, each.arg1);
            EXPECT_EQ(got.arg2, each.arg2);
            EXPECT_EQ(got.has_beats, each.beats);
            EXPECT_EQ(got.beats, each.beats ? times : std::vector<float>());
        }
    }
    EXPECT_EQ(fake_vm::seen().events.size(), 2 * std::size(cases));
}

TEST_F(Jni, ARepeatedSetupReplacesItsReferences) {
    ASSERT_EQ(init(song_path()), 0);
    call_back_on_a_thread({});
    setup(fake_vm::new_object());
    EXPECT_EQ(fake_vm::seen().global_references, 2);

    // In the middle of an event, the references that it uses live on until it has returned.
    fake_vm::on_event([] { setup(fake_vm::new_object()); });
    call_back_on_a_thread({});
    EXPECT_EQ(fake_vm::seen().global_references, 2);
    fake_vm::on_event(nullptr);
    call_back_on_a_thread({});
    setup(nullptr);  // a null object is passed on as null
    EXPECT_EQ(fake_vm::seen().global_references, 1);
    call_back_on_a_thread({});

    const std::vector<fake_vm::event> events = fake_vm::seen().events;
    ASSERT_EQ(events.size(), 4u);
    EXPECT_NE(events[0].object, events[1].object);
    EXPECT_NE(events[1].object, events[2].object);
    EXPECT_EQ(events[3].object, nullptr);
    setup(fake_vm::new_object());
}

TEST_F(Jni, AnEventCannotEndItsOwnJob) {
    ASSERT_EQ(init(song_path()), 0);
    jint ended = 0;
    jint opened = 0;
    fake_vm::on_event([&] {
        // Gives the deinit below the time to take the lock and wait for this event.
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        ended = deinit();
        opened = init(song_path());
    });
    ASSERT_EQ(analyze(), 0);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(ended, -1);
    EXPECT_EQ(opened, kBusy);
    EXPECT_TRUE(logged(std::string(kOpened) + "2: tavo_analyze \\(id:(\\d+)\\) - start\n" +
                       "6: tavo_deinit\\(\\1\\) is failed. error=-4\n" + kBusyLog +
                       "2: tavo_deinit\\(\\1\\) is finished successfully\n"));
}

TEST_F(Jni, ThreadsThatComeFirstTogetherShareOneLock) {
    constexpr int kThreads = 4;
    std::vector<jint> results(kThreads);
    std::vector<pthread_mutex_t *> locks(kThreads);
    std::vector<std::thread> threads;
    for (size_t i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            results[i] = init(song_path());
            locks[i] = __atomic_load_n(&tavo_jni_mutex, __ATOMIC_ACQUIRE);
        });
    }
    for (std::thread &thread : threads) thread.join();
    std::sort(results.begin(), results.end());
    EXPECT_EQ(results, std::vector<jint>({kBusy, kBusy, kBusy, 0}));
    EXPECT_EQ(std::count(locks.begin(), locks.end(), locks[0]), kThreads);
    EXPECT_NE(locks[0], nullptr);
}

TEST_F(Jni, SetupMayRaceWithEvents) {
    ASSERT_EQ(init(song_path()), 0);
    std::thread setups([] {
        for (int i = 0; i < 200; ++i) setup(fake_vm::new_object());
    });
    for (int i = 0; i < 200; ++i) call_back_on_a_thread({});
    setups.join();
    EXPECT_EQ(fake_vm::seen().events.size(), 200u);
}

}  // namespace

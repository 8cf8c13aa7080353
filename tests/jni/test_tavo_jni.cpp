#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <iterator>
#include <string>
#include <thread>
#include <vector>

#include "jni/tavo_jni.h"
#include "tests/jni/fake_vm.h"
#include "tests/support/song.h"

namespace {

using lines = std::vector<std::string>;

constexpr jint kBusy = -1;

void setup(jobject object) {
    Java_com_kestu_tavo_Tavo_native_1setup(fake_vm::environment(), fake_vm::new_object(), object);
}
jint init(const std::string &path, jint mode) {
    return Java_com_kestu_tavo_Tavo_init(fake_vm::environment(), fake_vm::new_object(),
                                         fake_vm::new_string(path), mode);
}
jint analyze(jint hl_param = 0) {
    return Java_com_kestu_tavo_Tavo_analyze(fake_vm::environment(), fake_vm::new_object(), hl_param,
                                            0, 0);
}
jint deinit() {
    return Java_com_kestu_tavo_Tavo_deinit(fake_vm::environment(), fake_vm::new_object());
}

// The bridge's own lines since the last look.
lines bridge_lines() {
    lines found;
    const lines log = fake_vm::seen().log;
    for (const std::string &line : log) {
        if (line.find("/tavo_jni: ") != std::string::npos) found.push_back(line);
    }
    fake_vm::forget_log();
    return found;
}

// The number between two texts of a line, or an empty string when the texts are not there.
std::string number_in(const std::string &line, const std::string &before,
                      const std::string &after) {
    if (line.size() < before.size() + after.size()) return "";
    const size_t end = line.size() - after.size();
    if (line.compare(0, before.size(), before) != 0 || line.compare(end, after.size(), after) != 0)
        return "";
    const std::string number = line.substr(before.size(), end - before.size());
    return number.find_first_not_of("0123456789") == std::string::npos ? number : "";
}

bool wait_for_event() {
    for (int ms = 0; ms < 120'000 && fake_vm::seen().events.empty(); ++ms) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return !fake_vm::seen().events.empty();
}

void call_back_on_a_thread(TAVO_INFO info) {
    std::thread worker([&info] { tavocallback(&info); });
    worker.join();
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

struct Jni : testing::Test {
    void SetUp() override {
        fnamedec = "";
        fake_vm::reset();
        ASSERT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), JNI_VERSION_1_6);
        object = fake_vm::new_object();
        setup(object);
        ASSERT_FALSE(song_path().empty());
        fake_vm::forget_calls();
        fake_vm::forget_log();
    }
    void TearDown() override {
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(fake_vm::seen().violations, lines());
        EXPECT_EQ(fake_vm::seen().held_characters, 0);
        EXPECT_EQ(fake_vm::seen().attached_threads, 0);
        EXPECT_EQ(fake_vm::seen().local_references, 0);
        EXPECT_EQ(fake_vm::seen().global_references, 2);
        EXPECT_FALSE(fake_vm::seen().exception_pending);
    }
    static void TearDownTestSuite() { unlink(song_path().c_str()); }
    jobject object = nullptr;
};

// First in this file: nothing of the bridge exists yet.
TEST(JniBeforeSetup, EveryCallIsHarmless) {
    fake_vm::reset();
    TAVO_INFO info = {};
    tavocallback(&info);  // no virtual machine
    EXPECT_EQ(bridge_lines(),
              lines({"6/tavo_jni: Failed to get the environment using AttachCurrentThread()"}));

    fake_vm::fail("GetEnv");
    EXPECT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), -1);
    ASSERT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), 0x10006);
    tavocallback(&info);  // no host
    EXPECT_EQ(bridge_lines(),
              lines({"6/tavo_jni: An exception occurred while notifying an event."}));
    EXPECT_TRUE(fake_vm::seen().events.empty());

    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(bridge_lines(), lines());
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_deinit() is failed. no instance"}));
    EXPECT_EQ(tavo_jni_mutex, nullptr);
    EXPECT_EQ(fake_vm::seen().violations, lines());
}

TEST_F(Jni, LifecycleAnswersAndLogsAsItIs) {
    ASSERT_EQ(init(song_path(), 0), 0);
    EXPECT_EQ(bridge_lines(), lines({"2/tavo_jni: tavo_init and setcallback is finished"}));
    EXPECT_EQ(fake_vm::seen().calls, lines({"GetStringUTFChars", "ReleaseStringUTFChars",
                                            "FindClass", "GetStaticMethodID", "DeleteLocalRef"}));
    EXPECT_NE(tavo_jni_mutex, nullptr);

    EXPECT_EQ(init(song_path(), 1), kBusy);
    EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_init is failed. already opened. "}));

    EXPECT_EQ(analyze(), 0);
    lines logged = bridge_lines();
    ASSERT_EQ(logged.size(), 1u);
    const std::string id = number_in(logged[0], "2/tavo_jni: tavo_analyze (id:", ") - start");
    EXPECT_NE(id, "");
    EXPECT_EQ(analyze(), -1);
    EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_analyze() is failed. error=-5"}));

    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(bridge_lines(),
              lines({"2/tavo_jni: tavo_deinit(" + id + ") is finished successfully"}));
    EXPECT_EQ(fake_vm::seen().events.size(), 1u);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_deinit() is failed. no instance"}));
    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(fake_vm::seen().events.size(), 1u);
}

TEST_F(Jni, AFailedInitLeavesNoInstance) {
    struct {
        const char *function;  // null: none fails
        std::string path;
    } const cases[] = {
        {"GetStringUTFChars", song_path()}, {"FindClass", song_path()},
        {"GetStaticMethodID", song_path()}, {nullptr, "/nowhere/no such file.wav"},
        {nullptr, std::string(512, 'x')},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.function != nullptr ? each.function : each.path);
        if (each.function != nullptr) fake_vm::fail(each.function);
        EXPECT_EQ(init(each.path, 0), -4);
        EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_init is failed. error=-4"}));
        EXPECT_FALSE(fake_vm::seen().exception_pending);
        EXPECT_EQ(fake_vm::seen().held_characters, 0);
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_deinit() is failed. no instance"}));
    }
    fake_vm::forget_calls();
    EXPECT_EQ(Java_com_kestu_tavo_Tavo_init(fake_vm::environment(), object, nullptr, 0), -4);
    EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: tavo_init is failed. error=-4"}));
    const lines called = fake_vm::seen().calls;
    EXPECT_EQ(std::count(called.begin(), called.end(), "GetStringUTFChars"), 0);

    EXPECT_EQ(init(song_path(), 0), 0);
}

TEST_F(Jni, AFailedSetupKeepsTheEarlierHost) {
    const std::pair<const char *, int> cases[] = {
        {"GetObjectClass", 1}, {"NewGlobalRef", 1}, {"NewGlobalRef", 2}};
    for (const auto &[function, nth] : cases) {
        SCOPED_TRACE(function + std::to_string(nth));
        fake_vm::fail(function, nth);
        Java_com_kestu_tavo_Tavo_native_1setup(fake_vm::environment(), object, object);
        EXPECT_EQ(bridge_lines(), lines({"6/tavo_jni: Can't find com/kestu/tavo/Tavo"}));
        EXPECT_FALSE(fake_vm::seen().exception_pending);
        EXPECT_EQ(fake_vm::seen().global_references, 2);
    }
    ASSERT_EQ(init(song_path(), 0), 0);
    call_back_on_a_thread({});
    EXPECT_EQ(fake_vm::seen().events.size(), 1u);
}

TEST_F(Jni, EventsCarryTheResult) {
    ASSERT_EQ(init(song_path(), 0), 0);
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
            fake_vm::forget_calls();
            TAVO_INFO info = each.info;
            own_thread ? tavocallback(&info) : call_back_on_a_thread(info);
            const fake_vm::event got = fake_vm::seen().events.back();
            EXPECT_NE(got.object, nullptr);
            EXPECT_EQ(got.what, each.what);
            EXPECT_EQ(got.arg1, each.arg1);
            EXPECT_EQ(got.arg2, each.arg2);
            EXPECT_EQ(got.has_beats, each.beats);
            EXPECT_EQ(got.beats, each.beats ? times : std::vector<float>());

            lines expected = {"GetEnv"};
            if (!own_thread) expected.push_back("AttachCurrentThread");
            if (each.beats)
                expected.insert(expected.end(), {"NewFloatArray", "SetFloatArrayRegion"});
            expected.push_back("CallStaticVoidMethod");
            if (each.beats) expected.push_back("DeleteLocalRef");
            expected.push_back("ExceptionCheck");
            if (!own_thread) expected.push_back("DetachCurrentThread");
            EXPECT_EQ(fake_vm::seen().calls, expected);
        }
    }
    EXPECT_EQ(fake_vm::seen().events.size(), 2 * std::size(cases));
}

TEST_F(Jni, EventsSurviveWhatFailsOnTheWay) {
    ASSERT_EQ(init(song_path(), 0), 0);
    bridge_lines();
    const std::string exception = "6/tavo_jni: An exception occurred while notifying an event.";
    float times[] = {1.0f, 2.0f};
    struct {
        const char *function;
        jint what, arg2;  // of the event; 0 for none
        std::string line;
    } const cases[] = {
        {"AttachCurrentThread", 0, 0,
         "6/tavo_jni: Failed to get the environment using AttachCurrentThread()"},
        {"NewFloatArray", 2, 0, exception},
        {"CallStaticVoidMethod", 1, 2, exception},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(each.function);
        fake_vm::fail(each.function);
        const size_t before = fake_vm::seen().events.size();
        call_back_on_a_thread({7000, 2, times, 0});
        EXPECT_EQ(bridge_lines(), lines({each.line}));
        ASSERT_EQ(fake_vm::seen().events.size() - before, each.what != 0 ? 1u : 0u);
        if (each.what == 0) continue;
        const fake_vm::event got = fake_vm::seen().events.back();
        EXPECT_EQ(got.what, each.what);
        EXPECT_EQ(got.arg1, 7000);
        EXPECT_EQ(got.arg2, each.arg2);
        EXPECT_EQ(got.has_beats, each.arg2 != 0);
    }
}

TEST_F(Jni, ARepeatedSetupReplacesItsReferences) {
    ASSERT_EQ(init(song_path(), 0), 0);
    call_back_on_a_thread({});
    setup(fake_vm::new_object());
    EXPECT_EQ(fake_vm::seen().global_references, 2);

    // In the middle of an event, the references that it uses live on until it has returned.
    fake_vm::on_event([] { setup(fake_vm::new_object()); });
    call_back_on_a_thread({});
    EXPECT_EQ(fake_vm::seen().global_references, 2);
    fake_vm::on_event(nullptr);
    call_back_on_a_thread({});
    const std::vector<fake_vm::event> events = fake_vm::seen().events;
    ASSERT_EQ(events.size(), 3u);
    EXPECT_NE(events[0].object, events[1].object);
    EXPECT_NE(events[1].object, events[2].object);

    setup(nullptr);  // a null object is passed on as null
    EXPECT_EQ(fake_vm::seen().global_references, 1);
    call_back_on_a_thread({});
    EXPECT_EQ(fake_vm::seen().events.back().object, nullptr);
    setup(object);
}

TEST_F(Jni, ARealJobPostsOneEventFromAThreadOfItsOwn) {
    for (jint mode = 0; mode <= 2; ++mode) {
        SCOPED_TRACE(mode);
        fake_vm::reset();
        setup(fake_vm::new_object());
        ASSERT_EQ(init(song_path(), mode), 0);
        ASSERT_EQ(analyze(), 0);
        ASSERT_TRUE(wait_for_event());
        EXPECT_EQ(deinit(), 0);
        ASSERT_EQ(fake_vm::seen().events.size(), 1u);
        const fake_vm::event got = fake_vm::seen().events[0];
        EXPECT_EQ(got.what, 1);
        EXPECT_TRUE(got.on_attached_thread);
        EXPECT_EQ(got.arg1 != 0, mode != 1);
        EXPECT_EQ(got.arg2 >= 1, mode != 0);
        EXPECT_EQ(got.beats.size(), static_cast<size_t>(got.arg2));
        EXPECT_TRUE(std::is_sorted(got.beats.begin(), got.beats.end()));
        EXPECT_EQ(fake_vm::seen().attached_threads, 0);
        EXPECT_EQ(fake_vm::seen().violations, lines());
    }
}

TEST_F(Jni, AnEventCannotEndItsOwnJob) {
    ASSERT_EQ(init(song_path(), 0), 0);
    jint ended = 0;
    jint opened = 0;
    fake_vm::on_event([&] {
        // Gives the deinit below the time to take the lock and wait for this event.
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        ended = deinit();
        opened = init(song_path(), 0);
    });
    ASSERT_EQ(analyze(), 0);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(ended, -1);
    EXPECT_EQ(opened, kBusy);
    const lines logged = bridge_lines();
    ASSERT_EQ(logged.size(), 5u);
    EXPECT_NE(number_in(logged[2], "6/tavo_jni: tavo_deinit(", ") is failed. error=-4"), "");
    EXPECT_EQ(logged[3], "6/tavo_jni: tavo_init is failed. already opened. ");
    EXPECT_NE(number_in(logged[4], "2/tavo_jni: tavo_deinit(", ") is finished successfully"), "");
}

TEST_F(Jni, ThreadsThatComeFirstTogetherShareOneLock) {
    constexpr int kThreads = 4;
    std::vector<jint> results(kThreads);
    std::vector<pthread_mutex_t *> locks(kThreads);
    std::vector<std::thread> threads;
    for (size_t i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            results[i] = init(song_path(), 0);
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
    ASSERT_EQ(init(song_path(), 0), 0);
    std::thread setups([] {
        for (int i = 0; i < 200; ++i) setup(fake_vm::new_object());
    });
    for (int i = 0; i < 200; ++i) call_back_on_a_thread({});
    setups.join();
    EXPECT_EQ(fake_vm::seen().events.size(), 200u);
}

}  // namespace

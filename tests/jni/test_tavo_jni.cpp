#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdarg>
#include <cstdio>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "jni/tavo_jni.h"
#include "tests/jni/fake_vm.h"
#include "tests/support/song.h"

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
        fake_vm::log_lines += std::to_string(prio) + ": " + text + "\n";
    }
    return 1;
}

namespace {

using numbers = std::vector<jint>;  // of an event

constexpr jint kBusy = -1;

constexpr char kOpened[] = "2: tavo_init and setcallback is finished\n";
constexpr char kBusyLog[] = "6: tavo_init is failed. already opened. \n";
constexpr char kUnusable[] = "6: tavo_init is failed. error=-4\n";
constexpr char kNoInstance[] = "6: tavo_deinit() is failed. no instance\n";
constexpr char kNoHost[] = "6: Can't find com/kestu/tavo/Tavo\n";
constexpr char kNotNotified[] = "6: An exception occurred while notifying an event.\n";
constexpr char kNotAttached[] = "6: Failed to get the environment using AttachCurrentThread()\n";

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

jstring song() {
    return fake_vm::new_string(song_path());
}

void setup(jobject object) {
    Java_com_kestu_tavo_Tavo_native_1setup(fake_vm::environment(), fake_vm::new_object(), object);
}
jint init(jstring path = song()) {
    return Java_com_kestu_tavo_Tavo_init(fake_vm::environment(), fake_vm::new_object(), path,
                                         TAVO_MODE_HIGHLIGHT);
}
jint analyze() {
    return Java_com_kestu_tavo_Tavo_analyze(fake_vm::environment(), fake_vm::new_object(), 0, 0, 0);
}
jint deinit() {
    return Java_com_kestu_tavo_Tavo_deinit(fake_vm::environment(), fake_vm::new_object());
}

void call_back_on_a_thread(TAVO_INFO info) {
    std::thread([&info] { tavocallback(&info); }).join();
}

void expect_all_given_back() {
    const fake_vm::record seen = fake_vm::seen();
    EXPECT_EQ(seen.violations, "");
    EXPECT_EQ(seen.lent, 0);
    EXPECT_EQ(seen.global_references, 2);  // the class and the object that setup was given
    EXPECT_FALSE(seen.exception_pending);
}

struct Jni : testing::Test {
    void SetUp() override {
        fnamedec = "";
        fake_vm::reset();
        ASSERT_EQ(JNI_OnLoad(fake_vm::machine(), nullptr), JNI_VERSION_1_6);
        setup(fake_vm::new_object());
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
    EXPECT_EQ(init(nullptr), -4);
    EXPECT_EQ(fake_vm::take_log(), kUnusable);
    EXPECT_EQ(tavo_jni_mutex, nullptr);
    EXPECT_EQ(fake_vm::seen().violations, "");
}

TEST_F(Jni, AJobIsOpenedStartedAndEndedOnce) {
    jint started = 0, ended = 0, opened = 0;
    fake_vm::on_event([&] {
        // Gives the deinit below the time to take the lock and wait for this event.
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        started = analyze();
        ended = deinit();
        opened = init();
    });
    EXPECT_EQ(init(), 0);
    EXPECT_EQ(init(), kBusy);
    EXPECT_NE(tavo_jni_mutex, nullptr);
    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(started, -1);
    EXPECT_EQ(ended, -1);
    EXPECT_EQ(opened, kBusy);
    EXPECT_EQ(deinit(), 0);
    EXPECT_EQ(analyze(), 0);
    EXPECT_EQ(fake_vm::seen().events.size(), 1u);

    const std::string log = fake_vm::take_log();
    const size_t at = log.find("(id:") + 4;
    const std::string id = log.substr(at, log.find(')', at) - at);
    EXPECT_EQ(id.find_first_not_of("0123456789"), std::string::npos);
    std::string expected = kOpened;
    expected += kBusyLog;
    expected += "2: tavo_analyze (id:" + id + ") - start\n";
    expected += "6: tavo_analyze() is failed. error=-5\n";
    expected += "6: tavo_deinit(" + id + ") is failed. error=-4\n";
    expected += kBusyLog;
    expected += "2: tavo_deinit(" + id + ") is finished successfully\n";
    expected += kNoInstance;
    EXPECT_EQ(log, expected);
}

// Lives from setup to deinit in which a call of the machine fails, or none. A failed setup keeps
// the earlier host, a failed init leaves no instance, and what fails in an event is known to the
// log alone.
TEST_F(Jni, OneEventCarriesTheResultWhateverFails) {
    std::vector<float> times(120);
    for (size_t i = 0; i < times.size(); ++i) times[i] = 500.0f * static_cast<float>(i) + 0.25f;
    const TAVO_INFO both = {29980, 120, times.data(), 0};
    const numbers none = {}, result = {1, 29980, 120};
    const std::string opened = kOpened;
    struct {
        const char *failing;
        int nth;
        TAVO_INFO info;
        std::string log;
        numbers event;
    } const cases[] = {
        {"", 0, both, opened, result},
        {"", 0, {62000, 0, nullptr, 0}, opened, {1, 62000, 0}},
        {"", 0, {29980, 0, nullptr, -1}, opened, {2, 29980, 0}},
        {"", 0, {0, 120, times.data(), -1}, opened, {2, 0, 0}},
        {"GetObjectClass", 1, both, kNoHost + opened, result},
        {"NewGlobalRef", 1, both, kNoHost + opened, result},
        {"NewGlobalRef", 2, both, kNoHost + opened, result},
        {"GetStringUTFChars", 1, both, kUnusable, none},
        {"FindClass", 1, both, kUnusable, none},
        {"GetStaticMethodID", 1, both, kUnusable, none},
        {"AttachCurrentThread", 1, both, opened + kNotAttached, none},
        {"NewFloatArray", 1, both, opened + kNotNotified, {2, 29980, 0}},
        {"CallStaticVoidMethod", 1, both, opened + kNotNotified, result},
    };
    for (const auto &each : cases) {
        SCOPED_TRACE(testing::Message() << each.failing << each.nth << ", " << each.info.hl_pos);
        const bool opens = each.log != kUnusable;
        fake_vm::reset();
        fake_vm::fail(each.failing, each.nth);
        setup(fake_vm::new_object());
        EXPECT_EQ(init(), opens ? 0 : -4);
        if (opens) call_back_on_a_thread(each.info);
        EXPECT_EQ(fake_vm::take_log(), each.log);
        expect_all_given_back();
        EXPECT_EQ(deinit(), 0);
        EXPECT_EQ(fake_vm::take_log() == kNoInstance, !opens);

        const std::vector<fake_vm::event> events = fake_vm::seen().events;
        ASSERT_EQ(events.size(), each.event.empty() ? 0u : 1u);
        if (events.empty()) continue;
        EXPECT_NE(events[0].object, nullptr);
        EXPECT_EQ(events[0].numbers, each.event);
        EXPECT_EQ(events[0].beats, each.event[2] != 0 ? std::optional(times) : std::nullopt);
    }
}

// From a thread that the machine knows, which stays attached.
TEST_F(Jni, ARepeatedSetupReplacesItsReferences) {
    ASSERT_EQ(init(), 0);
    TAVO_INFO info = {};
    tavocallback(&info);
    setup(fake_vm::new_object());
    EXPECT_EQ(fake_vm::seen().global_references, 2);

    // In the middle of an event, the references that it uses live on until it has returned.
    fake_vm::on_event([] { setup(fake_vm::new_object()); });
    tavocallback(&info);
    EXPECT_EQ(fake_vm::seen().global_references, 2);
    fake_vm::on_event(nullptr);
    tavocallback(&info);
    setup(nullptr);  // a null object is passed on as null
    EXPECT_EQ(fake_vm::seen().global_references, 1);
    tavocallback(&info);

    const std::vector<fake_vm::event> events = fake_vm::seen().events;
    ASSERT_EQ(events.size(), 4u);
    EXPECT_NE(events[0].object, events[1].object);
    EXPECT_NE(events[1].object, events[2].object);
    EXPECT_EQ(events[3].object, nullptr);
    setup(fake_vm::new_object());
}

TEST_F(Jni, OfThreadsThatComeTogetherOneOpens) {
    std::vector<jint> results(4);
    std::vector<std::thread> threads;
    for (jint &result : results) {
        threads.emplace_back([&result] { result = init(); });
    }
    for (std::thread &thread : threads) thread.join();
    std::sort(results.begin(), results.end());
    EXPECT_EQ(results, std::vector<jint>({kBusy, kBusy, kBusy, 0}));
}

TEST_F(Jni, SetupMayRaceWithEvents) {
    ASSERT_EQ(init(), 0);
    std::thread setups([] {
        for (int i = 0; i < 200; ++i) setup(fake_vm::new_object());
    });
    for (int i = 0; i < 200; ++i) call_back_on_a_thread({});
    setups.join();
    EXPECT_EQ(fake_vm::seen().events.size(), 200u);
}

}  // namespace

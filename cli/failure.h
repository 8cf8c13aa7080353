// How every part of the command reports that something went wrong: functions that can fail return a
// failure, which is false after success.
//
//     if (failure failed = write_file(target, content, force)) return failed;
#ifndef TAVO_CLI_FAILURE_H
#define TAVO_CLI_FAILURE_H

#include <string>

struct [[nodiscard]] failure {
    std::string sentence;       // what failed and why, for people; empty after success
    bool is_permanent = false;  // trying again cannot help

    explicit operator bool() const { return !sentence.empty(); }
};

#endif

// The result of a function that can fail. It converts to true if the function failed.
//
//     if (failure failed = write_file(target, content, force)) return failed;
#pragma once

#include <string>

struct [[nodiscard]] failure {
    std::string sentence;       // error message for the user; empty on success
    bool is_permanent = false;  // a retry cannot succeed

    explicit operator bool() const { return !sentence.empty(); }
};

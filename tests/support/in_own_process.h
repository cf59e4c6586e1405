#pragma once

#include <gtest/gtest.h>

#include <cstdlib>
#include <iostream>

// Writes the failed expectations of the running test to standard error, which is all that is seen
// of another process, and ends this one.
[[noreturn]] inline void exit_with_failures() {
    const testing::TestResult* result =
        testing::UnitTest::GetInstance()->current_test_info()->result();
    for (int i = 0; i < result->total_part_count(); i++) {
        const testing::TestPartResult& part = result->GetTestPartResult(i);
        if (part.failed()) {
            std::cerr << part.file_name() << ":" << part.line_number() << ": " << part.message()
                      << "\n";
        }
    }
    std::exit(result->Failed() ? 1 : 0);
}

// Runs a scenario in a process of its own, for state that a process has only once. The scenario's
// expectations count, and what it writes to standard error has to match `error_pattern`.
template <class Scenario>
void in_own_process(Scenario scenario, const char* error_pattern = "") {
    EXPECT_EXIT(
        {
            scenario();
            exit_with_failures();
        },
        testing::ExitedWithCode(0), error_pattern);
}

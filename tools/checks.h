// Checks of arguments and option values, made before anything runs: a
// value the library would cut, misread or pass on to a tool is a usage
// error of the command (exit status 2), never a half-done operation.
#pragma once

#include <cstddef>
#include <string>

#include <CLI/CLI.hpp>

namespace cli {

// Validators: each says what is wrong with a value, nothing when it is
// acceptable.
CLI::Validator IPv4();
CLI::Validator CupsQueueName();
// Not empty and at most `max` bytes: what a fixed-size field of the
// library's records holds without cutting.
CLI::Validator Text(std::size_t max);

// Widths of the library's records, minus the terminating NUL.
constexpr std::size_t kMaxPrinterId = 127;
constexpr std::size_t kMaxField = 127;
constexpr std::size_t kMaxDeviceId = 1023;

}  // namespace cli

#pragma once

#include <chrono>
#include <string>
#include <utility>

#include "ironmoat/client.h"
#include "ironmoat/command_response.h"

namespace ironmoat::testing {

using Outcome = ironmoat::Outcome<VeskCommandResponse>;
using Pending = ironmoat::Pending<VeskCommandResponse>;

inline ClientOptions optionsFor(std::string program,
                                std::chrono::milliseconds deadline = std::chrono::seconds(20)) {
  ClientOptions options;
  options.program = std::move(program);
  options.deadline = deadline;
  return options;
}

/// The record's command, or the error: "crashed: ...", "typeMismatch at a[1]: ...".
inline std::string inWords(const Outcome& outcome) {
  if (outcome) return std::to_string(outcome->command);
  if (const auto* const error = outcome.serviceError()) {
    return std::string(nameOf(error->kind())) + ": " + error->what();
  }
  const auto* const error = outcome.decodingError();
  if (error == nullptr) return "out of memory";
  return std::string(nameOf(error->kind())) + " at " + error->path() + ": " + error->what();
}

}  // namespace ironmoat::testing

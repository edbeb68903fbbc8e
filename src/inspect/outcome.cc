#include "inspect/outcome.h"

#include <algorithm>

namespace ironmoat::inspect {

namespace {

Failure failureOf(const ServiceError& error) {
  const bool noService = error.kind() == ServiceError::Kind::unavailable;
  return {nameOf(error.kind()), "", error.what(), {}, noService ? cannotWork : someRefused};
}

struct Accepted {
  const RecordType* type;
  std::unique_ptr<UnpackedRecord> record;
  std::size_t values;
};

Outcome refused(std::vector<Outcome::Refusal> refusals) {
  Outcome outcome;
  const Failure& first = refusals.front().why;
  if (std::all_of(refusals.begin(), refusals.end(),
                  [&](const Outcome::Refusal& refusal) { return refusal.why == first; })) {
    outcome.failure = first;
  } else {
    outcome.failure = {"noTypeFits", "", "every type refuses the message", {}, someRefused};
    outcome.refusals = std::move(refusals);
  }
  return outcome;
}

}  // namespace

Failure failureOf(const DecodingError& error) {
  return {nameOf(error.kind()), error.path(), error.what(), error.offset(), someRefused};
}

Failure failureOf(const std::system_error& error) {
  return {"unreadable", "", error.code().message(), {}, cannotWork};
}

Outcome outcomeOf(std::span<const Attempt> attempts) {
  Outcome outcome;
  std::vector<Accepted> accepted;
  std::vector<Outcome::Refusal> refusals;
  for (const Attempt& attempt : attempts) {
    try {
      auto record = attempt.record();
      const std::size_t values = attempts.size() == 1 ? 0 : record->values();
      accepted.push_back({attempt.type, std::move(record), values});
    } catch (const DecodingError& error) {
      refusals.push_back({attempt.type->name, failureOf(error)});
    } catch (const ServiceError& error) {
      outcome.failure = failureOf(error);
      return outcome;
    }
  }
  if (accepted.empty()) return refused(std::move(refusals));
  auto best = accepted.begin();
  for (auto other = best + 1; other != accepted.end(); ++other) {
    if (other->values > best->values) best = other;
  }
  outcome.type = best->type;
  outcome.record = std::move(best->record);
  for (const Accepted& other : accepted) {
    if (&other != &*best && other.values == best->values)
      outcome.asWell.push_back(other.type->name);
  }
  return outcome;
}

}  // namespace ironmoat::inspect

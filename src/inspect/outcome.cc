#include "inspect/outcome.h"

#include <algorithm>

#include "inspect/present_fields.h"

namespace ironmoat::inspect {

namespace {

/// Counts the values in a record and in its nested records.
template <class T>
std::size_t valuesIn(const T& value) {
  std::size_t values = 0;
  if constexpr (kIsList<T>) {
    for (const auto& element : value) values += valuesIn(element);
  } else if constexpr (Record<T>) {
    forEachPresentField(value,
                        [&](std::string_view, const auto& field) { values += valuesIn(field); });
  } else {
    values = 1;
  }
  return values;
}

}  // namespace

Failure failureOf(const DecodingError& error) {
  return {nameOf(error.kind()), error.path(), error.what(), error.offset(), someRejected};
}

Failure failureOf(const ServiceError& error) {
  const bool noService = error.kind() == ServiceError::Kind::unavailable;
  return {nameOf(error.kind()), "", error.what(), {}, noService ? cannotWork : someRejected};
}

Failure failureOf(const std::system_error& error) {
  return {"unreadable", "", error.code().message(), {}, cannotWork};
}

Outcome outcomeOf(std::vector<Attempt>& attempts) {
  Outcome outcome;
  std::size_t most = 0;
  for (Attempt& attempt : attempts) {
    try {
      auto record =
          std::visit([](auto& pending) -> AnyRecord { return pending.get(); }, attempt.record);
      const std::size_t values = std::visit([](const auto& r) { return valuesIn(r); }, record);
      if (!outcome.record || values > most) {
        outcome.record = std::move(record);
        outcome.types.clear();
        most = values;
      }
      if (values == most) outcome.types.push_back(attempt.type);
    } catch (const DecodingError& error) {
      outcome.rejections.push_back({attempt.type, failureOf(error)});
    } catch (const ServiceError& error) {
      Outcome failed;
      failed.failure = failureOf(error);
      return failed;
    }
  }
  if (outcome.record) return outcome;
  outcome.failure = outcome.rejections.front().why;
  if (std::all_of(outcome.rejections.begin(), outcome.rejections.end(),
                  [&](const auto& rejection) { return rejection.why == *outcome.failure; })) {
    outcome.rejections.clear();
  } else {
    outcome.failure = {"noTypeFits", "", "every type rejects the message", {}, someRejected};
  }
  return outcome;
}

}  // namespace ironmoat::inspect

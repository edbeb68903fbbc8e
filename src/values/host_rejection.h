#pragma once

#include <exception>

#include "ironmoat/errors.h"
#include "ironmoat/output_record.h"

namespace ironmoat {

/// Calls `act`. What an output record's initialiser throws in it leaves as a DecodingError
/// `rejectedByHost` with the exception's description, whatever its type; every other exception
/// leaves as it is.
template <class Act>
void withHostRejections(const Act& act) {
  const auto translate = [](const char* description) {
    if (!detail::initialiserThrew) throw;
    throw DecodingError(DecodingError::Kind::rejectedByHost, "", description);
  };
  detail::initialiserThrew = false;
  try {
    act();
  } catch (const std::exception& error) {
    translate(error.what());
  } catch (...) {
    translate("the host rejected the record");
  }
}

}  // namespace ironmoat

#include "plist/document.h"

namespace ironmoat::plist {

std::string_view nameOf(Kind kind) noexcept {
  switch (kind) {
    case Kind::dictionary:
      return "dictionary";
    case Kind::array:
      return "array";
    case Kind::set:
      return "set";
    case Kind::string:
      return "string";
    case Kind::data:
      return "data";
    case Kind::integer:
    case Kind::wideInteger:
      return "integer";
    case Kind::boolean:
      return "boolean";
    case Kind::real:
      return "real";
    case Kind::date:
      return "date";
    case Kind::uid:
      return "UID";
    case Kind::null:
      return "null";
  }
  return "value";
}

}  // namespace ironmoat::plist

#pragma once

namespace ironmoat {

/// The process's preferences. This platform has no store of them, so that what the two switches ask
/// for holds already: nothing in the process writes preferences, and it depends on no service that
/// would.
class PreferencesStore {
 public:
  /// The process accesses its preferences itself.
  static void enableDirectMode(bool enabled);
  /// No write is accepted.
  static void enableReadOnlyMode(bool enabled);
};

}  // namespace ironmoat

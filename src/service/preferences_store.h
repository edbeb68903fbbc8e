#pragma once

namespace ironmoat {

/// The process's preferences. This platform has no store of them, so both switches are already
/// satisfied: the process writes no preferences and depends on no preferences service.
class PreferencesStore {
 public:
  /// The process accesses its preferences itself.
  static void enableDirectMode(bool enabled);
  /// The store accepts no writes.
  static void enableReadOnlyMode(bool enabled);
};

}  // namespace ironmoat

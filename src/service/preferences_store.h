#pragma once

namespace ironmoat {

/// The process's preferences, of which this service has none: there is nothing to read, and once
/// read-only mode is on nothing can ever be written.
class PreferencesStore {
 public:
  /// The process accesses its preferences itself, without a preferences service.
  static void enableDirectMode(bool enabled);
  /// No write is accepted.
  static void enableReadOnlyMode(bool enabled);

  [[nodiscard]] static bool isDirect();
  [[nodiscard]] static bool isReadOnly();
};

}  // namespace ironmoat

#include "service/preferences_store.h"

#include <atomic>

namespace ironmoat {

namespace {
std::atomic<bool> direct = false;
std::atomic<bool> readOnly = false;
}  // namespace

void PreferencesStore::enableDirectMode(bool enabled) { direct = enabled; }
void PreferencesStore::enableReadOnlyMode(bool enabled) { readOnly = enabled; }
bool PreferencesStore::isDirect() { return direct; }
bool PreferencesStore::isReadOnly() { return readOnly; }

}  // namespace ironmoat

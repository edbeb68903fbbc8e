#include "service/preferences_store.h"

namespace ironmoat {

void PreferencesStore::enableDirectMode(bool) {}
void PreferencesStore::enableReadOnlyMode(bool) {}

}  // namespace ironmoat

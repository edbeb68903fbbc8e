// Suppressions for ThreadSanitizer, linked into programs that pass exceptions between threads.
//
// libstdc++.so counts the references to an exception and is not instrumented: the sanitizer sees
// that the last owner frees what another one has read, but not the atomic count between the two.

extern "C" [[gnu::visibility("default")]] const char* __tsan_default_suppressions();
extern "C" const char* __tsan_default_suppressions() {
  return "race:std::__exception_ptr::exception_ptr::_M_release\n";
}

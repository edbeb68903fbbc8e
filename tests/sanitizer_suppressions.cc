// Linked into programs that throw errors from one thread to another, for ThreadSanitizer alone.
//
// The count of references to an exception is kept by libstdc++.so, which is not instrumented: the
// sanitizer sees the last owner free what another one read, and not the atomic count between them.

extern "C" [[gnu::visibility("default")]] const char* __tsan_default_suppressions();
extern "C" const char* __tsan_default_suppressions() {
  return "race:std::__exception_ptr::exception_ptr::_M_release\n";
}

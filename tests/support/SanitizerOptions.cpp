// For tests that use GLib.

#if defined(__SANITIZE_THREAD__)
// GLib is not built with the sanitizer, which sees its threads' memory but not what orders them.
extern "C" const char* __tsan_default_options() {
  return "ignore_noninstrumented_modules=1";
}
#endif

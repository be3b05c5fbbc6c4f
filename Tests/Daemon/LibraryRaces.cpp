#if defined(__has_feature)
#if __has_feature(thread_sanitizer)

extern "C" const char* __tsan_default_suppressions();

// libsystemd is not instrumented: the sanitizer sees its system calls write to its own globals (the
// key of its hash tables, made once), but not what it orders them by.
extern "C" const char* __tsan_default_suppressions() {
    return "called_from_lib:libsystemd.so.0\n";
}

#endif
#endif

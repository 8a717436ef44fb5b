// The objects of a library are linked beside the library itself, so its variables are there twice, on purpose.
extern "C" __attribute__((visibility("default"))) const char* __asan_default_options();
extern "C" const char* __asan_default_options() {
    return "detect_odr_violation=0";
}

// A loadable module for the dynamic-library tests.
extern "C" __attribute__((visibility("default"))) int tavow3_test_module_value() { return 7; }

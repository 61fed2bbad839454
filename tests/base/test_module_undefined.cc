// A module with a function that no loaded object defines: it loads with lazy
// binding and fails with immediate binding.
extern "C" void tavow3_test_missing_function();

extern "C" __attribute__((visibility("default"))) void tavow3_test_call_missing() {
  tavow3_test_missing_function();
}

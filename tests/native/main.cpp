// Runs the tests on a thread of Wine's: the sanitizer knows its stack, but not that of the first one.
namespace {

DWORD WINAPI RunTests(void*) {
  const int result = RUN_ALL_TESTS();
  std::fflush(nullptr);
  std::_Exit(result);  // Wine's own end of a process has no status
}

}  // namespace

int main(int argc, char** argv) {
  testing::InitGoogleMock(&argc, argv);
  // TortureOfMemory counts allocations, of which libstdc++.so makes a part here. TortureOfObjects
  // replaces imports, which Linux code does not have.
  std::string& filter = testing::GTEST_FLAG(filter);
  filter += std::string(filter.find('-') == std::string::npos ? "-" : ":") +
            "*TortureOfMemory.*:*TortureOfObjects.*";
  constexpr SIZE_T kStackSize = 8 * 1024 * 1024;
  const HANDLE thread = CreateThread(nullptr, kStackSize, RunTests, nullptr, 0, nullptr);
  WaitForSingleObject(thread, INFINITE);
  return 1;
}

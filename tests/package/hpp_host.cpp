// A host that uses rcvlink.hpp of an installed tree:
//   package_hpp PORT NAME
#include <rcvlink.hpp>

#include <cstdio>
#include <exception>

int wmain(int argc, wchar_t** argv) try {
  if (argc != 3) return 2;
  auto receiver = rcvlink::Receiver::Find(argv[1]);
  const rcvlink::Identity identity = receiver.Identify();
  std::size_t count = 0;
  const auto add = [&](std::span<const std::byte> bytes) { count += bytes.size(); };
  receiver.Download(receiver.FindFile(argv[2]), add);
  std::printf("%ls %ls %zu\n", identity.model.c_str(), identity.id.c_str(), count);
  return 0;
} catch (const std::exception& error) {
  std::puts(error.what());
  return 1;
}

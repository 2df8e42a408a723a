// The SHA-256 of a stream of bytes, computed by Windows.
#ifndef RCVLINK_CLI_SHA256_H_
#define RCVLINK_CLI_SHA256_H_

#include <windows.h>

#include <bcrypt.h>

#include <memory>
#include <string>

namespace cli {

class Sha256 {
 public:
  Sha256();

  void Add(const void* data, DWORD size);

  // 64 hexadecimal digits in small letters, of all that was added; empty when Windows could not
  // compute it. To be called once, at the end.
  std::string Finish();

 private:
  struct AlgorithmCloser {
    void operator()(void* algorithm) const { BCryptCloseAlgorithmProvider(algorithm, 0); }
  };
  struct HashDestroyer {
    void operator()(void* hash) const { BCryptDestroyHash(hash); }
  };

  std::unique_ptr<void, AlgorithmCloser> algorithm_;
  std::unique_ptr<void, HashDestroyer> hash_;  // ends before its algorithm
  bool failed_ = false;
};

}  // namespace cli

#endif  // RCVLINK_CLI_SHA256_H_

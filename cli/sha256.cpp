#include "sha256.h"

#include <array>

#include "text.h"

namespace cli {

Sha256::Sha256() {
  BCRYPT_ALG_HANDLE algorithm = nullptr;
  if (!BCRYPT_SUCCESS(
          BCryptOpenAlgorithmProvider(&algorithm, BCRYPT_SHA256_ALGORITHM, nullptr, 0))) {
    return;
  }
  algorithm_.reset(algorithm);
  BCRYPT_HASH_HANDLE hash = nullptr;
  // Without memory of ours Windows allocates its own.
  if (BCRYPT_SUCCESS(BCryptCreateHash(algorithm, &hash, nullptr, 0, nullptr, 0, 0))) {
    hash_.reset(hash);
  }
}

void Sha256::Add(const void* data, DWORD size) {
  if (!hash_) return;
  // The function reads only, but takes a pointer to bytes that may change.
  auto* const bytes = static_cast<PUCHAR>(const_cast<void*>(data));
  failed_ |= !BCRYPT_SUCCESS(BCryptHashData(hash_.get(), bytes, size, 0));
}

std::string Sha256::Finish() {
  constexpr size_t kBytes = 32;
  constexpr size_t kDigitsOfByte = 2;
  std::array<UCHAR, kBytes> digest{};
  if (!hash_ || failed_) return {};
  if (!BCRYPT_SUCCESS(BCryptFinishHash(hash_.get(), digest.data(), kBytes, 0))) return {};
  std::string text;
  for (const UCHAR byte : digest) text += Lowered(Hex(byte, kDigitsOfByte));
  return text;
}

}  // namespace cli

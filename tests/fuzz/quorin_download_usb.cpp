// A whole download from a Quorin receiver over USB.
#include "tests/fuzz/quorin_download.h"

void fuzz::Target(std::span<const uint8_t> bytes) { Download(bytes, eInstanceUSB); }

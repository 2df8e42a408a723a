// A Quorin receiver's listing of its files.
#ifndef SIMULATOR_QUORIN_DIRECTORY_H_
#define SIMULATOR_QUORIN_DIRECTORY_H_

#include <cstdint>
#include <ctime>
#include <string>
#include <vector>

#include "simulator/files.h"

namespace sim {

// Seconds since 1988-01-01 00:00:00 local time, the receiver's zero; 0 for anything earlier.
uint64_t SecondsSince1988(std::time_t time);

// The texts of the messages that list `files`, one message a file.
std::vector<std::string> ListDirectory(const std::vector<FileEntry>& files);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_DIRECTORY_H_

// A host in C++20 that has included rcvlink.h before <windows.h>: file times have a record of rcvlink.h.
#include "rcvlink.h"

#include "rcvlink.hpp"

bool Host(rcvlink::Receiver& receiver, const rcvlink::Sink& sink, std::stop_token stop) {
  for (const rcvlink::File& file : receiver.Files(stop)) {
    receiver.Download(file, sink, {.progress = [](int) {}, .stop = stop});
    receiver.Download(file, file.name);
  }
  return receiver.Answers();
}

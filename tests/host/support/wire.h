// Reading the transcript of a simulated receiver: what went over the line.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_WIRE_H_
#define RCVLINK_TESTS_HOST_SUPPORT_WIRE_H_

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace host {

using Lines = std::vector<std::string>;

// The lines of a transcript from number `first` on. Tags are counted per process, so they are
// replaced with %#%; so are the headers of tagged replies, whose length depends on the
// tag: "< RE%#%text". Blocks are without their CRC.
Lines WireLines(const std::string& transcript, size_t first = 0);
// Only what the host sent, without the mark before it.
Lines SentByHost(const std::string& transcript, size_t first = 0);
// The numbers of the tags that the host sent, in order.
std::vector<int> TagsOf(const std::string& transcript);

size_t CountOf(const Lines& lines, std::string_view line);
size_t CountStarting(const Lines& lines, std::string_view start);

// The handshake with which the host finds a receiver, with port letter 'a'.
Lines HandshakeOfHost();

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_WIRE_H_

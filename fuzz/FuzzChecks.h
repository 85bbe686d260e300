#pragma once

// The checks behind the fuzz targets, as plain functions so that the test suite can
// replay the corpora and the regression inputs through them with any compiler.

#include <cstddef>
#include <cstdint>
#include <string>

namespace zarl::fuzz {

// Called when a check finds a wrong outcome, with a description of it. The default
// prints the description and aborts, which is what a fuzzer reports as a crash; the
// regression test installs one that throws instead. A handler must not return: if it
// does, the process aborts.
using FailureHandler = void (*)(const std::string& description);
void SetFailureHandler(FailureHandler handler);

// Turns the input into the values, content or items of one message builder
// (ZARLRequest string and list form, ZARLResponse string and list form including the
// "GetStatus" list form, ZARLFailedResponse message form) and checks the outcome:
//   - a value holding a byte that XML 1.0 cannot carry (0x00-0x08, 0x0B, 0x0C,
//     0x0E-0x1F): zarl::util::Exception naming that byte and its offset;
//   - otherwise, when every value is UTF-8 made of XML characters: ParseMessage reads
//     the text back with every value unchanged, in order, and the content bytes
//     unchanged (the content is generated well-formed, so it must survive);
//   - otherwise (a value that is not UTF-8, or holds U+FFFE, U+FFFF): the builders
//     pass such bytes on unchanged, and ParseMessage must refuse the text with
//     zarl::util::Exception.
// Any other outcome is a failure.
void CheckBuilders(const std::uint8_t* data, std::size_t size);

// Feeds the input to ParseMessage whole, and to a MessageFramer in chunks whose sizes
// and whose message size limit the input chooses, then parses every framed message.
// ParseMessage may only return a message that has every attribute its kind requires
// or throw zarl::util::Exception; the framer must hand back exactly the messages that
// a plain reading of the stream finds, and an exception in place of each one over the
// limit.
void CheckParserAndFramer(const std::uint8_t* data, std::size_t size);

}  // namespace zarl::fuzz

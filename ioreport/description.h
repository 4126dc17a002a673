// Channels and samples as text for people, and writing such text.
//
//   const auto text = IOReportSampleCopyDescription(channel, 0, "  ");
//   if (text) std::fputs(text->c_str(), stdout);
//
// Names and labels that a channel does not have are shown as "(null)". A description is whole or
// it is nothing; one that would not fit the memory that a device may claim is nothing.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"
#include "platform/descriptor_writer.h"

namespace tavrel {

/// One line: what the channel is. The prefix stands at its beginning; the options are not read.
std::optional<std::string> IOReportChannelCopyDescription(const plist::Dictionary& channel,
                                                          std::uint32_t options,
                                                          const char* linePrefix);

/// The values of a sampled channel, a line for each element.
std::optional<std::string> IOReportSampleCopyDescription(const plist::Dictionary& channel,
                                                         std::uint32_t options,
                                                         const char* linePrefix);

/// Writes a text, up to its first zero byte, with a single call. A short write is an underrun and
/// not made up for.
KernelReturn IOReportWriteStringUTF8(DescriptorWriter& writer, int descriptor,
                                     std::optional<std::string_view> string);

}  // namespace tavrel

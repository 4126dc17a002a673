// Channels and samples as text for people, and writing such text.
//
//   const auto text = IOReportSampleCopyDescription(channel, 0, "  ");
//   if (text) std::fputs(text->c_str(), stdout);
//
// Missing names and labels are shown as "(null)". A description is whole or absent; one that
// exceeds the memory that a device may claim is absent.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"
#include "platform/descriptor_writer.h"

namespace tavrel {

/// One line that says what the channel is, beginning with the prefix. The options are ignored.
std::optional<std::string> IOReportChannelCopyDescription(const plist::Dictionary& channel,
                                                          std::uint32_t options,
                                                          const char* linePrefix);

/// The values of a sampled channel, a line for each element.
std::optional<std::string> IOReportSampleCopyDescription(const plist::Dictionary& channel,
                                                         std::uint32_t options,
                                                         const char* linePrefix);

/// Writes a text, up to its first zero byte, with a single call. A short write is an underrun; the
/// rest is not written.
KernelReturn IOReportWriteStringUTF8(DescriptorWriter& writer, int descriptor,
                                     std::optional<std::string_view> string);

}  // namespace tavrel

// Channels and samples as text for people, and writing such text.
//
//   const auto text = IOReportSampleCopyDescription(channel, 0, "  ");
//   if (text) std::fputs(text->c_str(), stdout);
//
// Missing names and labels are shown as "(null)". A description is complete or absent; it is absent
// when it would take more memory than a device may demand.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"
#include "platform/descriptor_writer.h"

namespace tavrel {

/// One line that identifies the channel, beginning with the prefix. The options are ignored.
std::optional<std::string> IOReportChannelCopyDescription(const plist::Dictionary& channel,
                                                          std::uint32_t options,
                                                          const char* linePrefix);

/// The values of a sampled channel, a line for each element.
std::optional<std::string> IOReportSampleCopyDescription(const plist::Dictionary& channel,
                                                         std::uint32_t options,
                                                         const char* linePrefix);

/// Writes a text, up to its first zero byte, with a single call. A short write counts as an
/// underrun; the rest is not written.
KernelReturn IOReportWriteStringUTF8(DescriptorWriter& writer, int descriptor,
                                     std::optional<std::string_view> string);

}  // namespace tavrel

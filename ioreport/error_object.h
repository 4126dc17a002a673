// How the library reports failures.
//
// An operation returns a code or an empty handle, and says more in an error object when its caller
// passes a place for one:
//
//   std::optional<ErrorObject> error;
//   if (!IOReportCopyChannelsForDriver(service, 0, &error)) log(error->failureReason);
//
// Only failures write to that place; the outermost operation that has an error to report decides.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/kernel_return.h"
#include "platform/standard_streams.h"

namespace tavrel {

/// The domain of kernel return codes.
inline constexpr std::string_view kKernelReturnDomain = "KernelReturn";

struct ErrorObject {
  std::string_view domain = kKernelReturnDomain;
  KernelReturn code = kKernelError;
  std::optional<std::string> failureReason;

  /// Domain and code, for an error without a reason.
  std::string description() const;
};

/// Where an operation puts its error; null when the caller does not want one.
using ErrorOut = std::optional<ErrorObject>*;

/// An error with a reason, which is UTF-8. Nothing when the text is malformed or memory runs out; a
/// fixed reason when there is no text.
std::optional<ErrorObject> createCFErr(KernelReturn code, const char* text);

/// Puts an error in its place, if there is one, and returns the code.
KernelReturn fail(ErrorOut error, KernelReturn code, const char* text);

/// The sign bit of an aggregate's options: errors of single drivers are printed.
inline constexpr std::int32_t kOptionPrintErrors = INT32_MIN;

/// Prints a line on standard error when the options have `kOptionPrintErrors`.
void iorErrLog(StandardStreams& streams, std::int32_t options,
               std::optional<std::string_view> functionName,
               const std::optional<ErrorObject>& error);

}  // namespace tavrel

#include "ioreport/error_object.h"

#include "base/format.h"
#include "base/utf8.h"
#include "ioreport/allocation.h"

namespace tavrel {

std::string ErrorObject::description() const {
  return format("%s error %#x", domain, code);
}

std::optional<ErrorObject> createCFErr(KernelReturn code, const char* text) {
  const std::string_view reason = text ? text : "createCFErr() passed a NULL string!";
  if (!isValidUtf8(reason)) return std::nullopt;
  return madeOrNull([&] {
    return std::optional(ErrorObject{.code = code, .failureReason = std::string(reason)});
  });
}

KernelReturn fail(ErrorOut error, KernelReturn code, const char* text) {
  if (error) *error = createCFErr(code, text);
  return code;
}

void iorErrLog(StandardStreams& streams, std::int32_t options,
               std::optional<std::string_view> functionName,
               const std::optional<ErrorObject>& error) {
  if ((options & kOptionPrintErrors) == 0) return;
  const std::string_view name = functionName.value_or("<unknown> function");
  if (error) {
    streams.printError("%@: %@\n", name, error->failureReason.value_or(error->description()));
  } else {
    streams.printError("%@: %s\n", name, "<unknown> error");
  }
}

}  // namespace tavrel

#include "platform/linux/files/system_error.h"

#include <unistd.h>

#include "base/system_text.h"

namespace tavrel {
namespace {

std::string_view adviceFor(int code) {
  switch (code) {
    case EACCES:
    case EPERM:
      return geteuid() != 0 ? "; run as root or as the owner of the files" : "";
    case ENOSPC:
    case EDQUOT:
      return "; free some space";
    case EMFILE:
      return "; raise the number of files that a process may open (ulimit -n)";
    case EROFS:
      return "; make the file system writable";
    default:
      return "";
  }
}

}  // namespace

Error systemError(std::string_view what, std::string_view path, int code) {
  std::string message = "cannot ";
  message += what;
  message += ' ';
  message += path;
  message += ": ";
  message += systemText(code);
  message += adviceFor(code);
  return Error{std::move(message)};
}

}  // namespace tavrel

// What the files that declare subcommands of tavrelctl have in common.
#pragma once

#include <memory>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Adds a subcommand that runs `action`; its options fill the arguments.
template <class Arguments>
Command addCommand(Command group, const char* name, const char* description,
                   const std::shared_ptr<Arguments>& arguments, ToolContext& context,
                   std::type_identity_t<void (*)(ToolContext&, const Arguments&)> action) {
  const Command command = group.addCommand(name, description);
  command.onRun([&context, arguments, action] { action(context, *arguments); });
  return command;
}

/// What is wrong with the text of an option that counts `things`, such as "days"; empty when
/// nothing is.
std::string countFault(const std::string& text, const char* things);

}  // namespace tavrel

#include "tools/device/send_commands.h"

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>

#include "base/format.h"
#include "daemon/app_info.h"
#include "daemon/app_info_listener.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/service/file_notifications.h"
#include "platform/linux/service/service_client.h"
#include "platform/linux/service/service_socket.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/console/typed_value.h"
#include "tools/shared/input_file.h"

namespace tavrel {
namespace {

constexpr std::string_view kFirstRequestWins =
    "a service process acts on one request: it ignores this one if another came first";

bool isInteger(const plist::Value& value) {
  const auto number = value.number();
  return number && !number->isFloating();
}

void send(ToolContext& context, const plist::Dictionary& message, const std::string& done) {
  auto client = ServiceClient::connect(context.root(), kAppInfoServiceName);
  if (!client) return context.fail(client.error().message);
  if (const auto sent = client->send(message); !sent) return context.fail(sent.error().message);
  context.out() << done << '\n';
  if (message.number("operation")->int64() != kDeliverAppInfo) context.note(kFirstRequestWins);
}

void force(ToolContext& context, const std::string& dayArgument) {
  const auto day = parseDay(dayArgument, context.platform().statistics->BHDaysSince1970());
  if (!day) return context.failUsage(day.error().message);
  send(context, {{"operation", kForceDay}, {"value", *day}},
       format("Asked for the daily tasks of day %s.", dayText(*day)));
}

void deliver(ToolContext& context, const std::string& file) {
  const auto document = readDocument(context, file);
  if (!document) return context.fail(document.error().message);
  const auto applications = appDataOf(*document);
  if (!applications) {
    const std::string_view name = file == "-" ? "standard input" : std::string_view(file);
    return context.fail(format("%s: %s", name, applications.error().message));
  }
  send(context, {{"operation", kDeliverAppInfo}, {"app_data", *applications}},
       format("Delivered %s.", counted(applications->size(), "application")));
}

void printCount(ToolContext& context, const std::string& name, std::uint64_t count) {
  if (context.json()) return context.printJson({{"name", name}, {"count", count}});
  context.out() << name << ": posted " << counted(count, "time") << '\n';
}

void wait(ToolContext& context, const std::string& name, const std::string& timeout) {
  // Longer than any real wait. Converting a larger number would be undefined behaviour.
  constexpr double kLongestSeconds = 1e9;
  double longest = kLongestSeconds;
  if (!timeout.empty()) {
    const auto seconds = parseArgument(timeout, ArgumentKind::Real);
    if (!seconds || !(seconds->number()->real() >= 0)) {
      return context.failUsage(
          format("not a number of seconds: %s: give 0 or more, such as 2.5", timeout));
    }
    longest = std::min(seconds->number()->real(), kLongestSeconds);
  }
  const FileNotifications notifications(context.root(), context.platform().log);
  const auto seen = notifications.count(name);
  if (!seen) return context.fail(seen.error().message);
  const auto count = notifications.waitBeyond(
      name, *seen, std::chrono::milliseconds(static_cast<std::int64_t>(longest * 1000)));
  if (!count) return context.fail(count.error().message);
  if (!*count) {
    return context.fail(
        format("%s was not posted within %g second%s", name, longest, longest == 1 ? "" : "s"));
  }
  printCount(context, name, **count);
}

void post(ToolContext& context, const std::string& name) {
  FileNotifications notifications(context.root(), context.platform().log);
  const auto count = notifications.tryPost(name);
  if (!count) return context.fail(count.error().message);
  printCount(context, name, *count);
}

std::string notificationFault(const std::string& name) {
  if (isServiceName(name)) return {};
  return format(
      "not the name of a notification: %s: give letters, digits, '.', '-' and '_', not "
      "beginning with '.', at most %zu",
      name, limits::kServiceNameBytes);
}

}  // namespace

Expected<plist::Array> appDataOf(const plist::Value& applications) {
  const plist::Array elements = applications.array();
  if (!elements) {
    return Error{
        "not an array of applications: give dictionaries with \"bundle_id\", \"version\" and "
        "\"uuid\""};
  }
  plist::Array result = plist::Array::create(elements.size());
  for (std::size_t i = 0; i < elements.size(); ++i) {
    const plist::Dictionary application = elements.at(i).dictionary();
    const auto wrong = [i](std::string_view entry, std::string_view wanted) {
      return Error{format("application %llu: \"%s\" must be %s", std::uint64_t{i}, entry, wanted)};
    };
    if (!application) return Error{format("element %llu is not a dictionary", std::uint64_t{i})};
    plist::Dictionary checked = plist::Dictionary::create(5);
    for (const std::string_view entry : {"bundle_id", "version"}) {
      if (!application.string(entry)) return wrong(entry, "a string");
      checked.set(entry, application.get(entry));
    }
    for (const std::string_view entry : {"orbo_id", "arch"}) {
      const plist::Value number = application.get(entry);
      if (!number) continue;  // the service reads it as 0
      if (!isInteger(number)) return wrong(entry, "an integer");
      checked.set(entry, number);
    }
    const plist::Value uuid = application.get("uuid");
    if (!appUuidFrom(uuid)) {
      return wrong("uuid", "a UUID, as text of 36 characters or 16 bytes of data");
    }
    checked.set("uuid", uuid);
    result.append(checked);
  }
  return result;
}

void addSendCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("send", "Send a message to the service, as a client does");

  const Command announceCommand =
      group.addCommand("announce", "Announce that application information will be delivered");
  announceCommand.onRun([&context] {
    send(context, {{"operation", kAnnounceAppInfo}}, "Announced app information.");
  });

  const Command forceCommand =
      group.addCommand("force", "Have the service run the daily tasks of a day");
  const auto day = std::make_shared<std::string>();
  forceCommand.addOption("DAY", *day, "today, yesterday, a day number or YYYY-MM-DD, UTC")
      .required();
  forceCommand.onRun([&context, day] { force(context, *day); });

  const Command deliverCommand = group.addCommand("deliver", "Deliver application information");
  const auto file = std::make_shared<std::string>();
  deliverCommand
      .addOption("FILE", *file,
                 "Property list or JSON: an array of dictionaries with \"bundle_id\", \"version\", "
                 "\"uuid\", and \"orbo_id\" and \"arch\" unless 0; - for standard input")
      .required()
      .notEmpty();
  deliverCommand.onRun([&context, file] { deliver(context, *file); });
}

void addNotifyCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("notify", "Wait for and post notifications");
  const auto name = std::make_shared<std::string>();
  const auto timeout = std::make_shared<std::string>();

  const Command waitCommand = group.addCommand("wait", "Wait until a notification is posted");
  waitCommand.addOption("NAME", *name, "Such as com.norvane.tallied.tavrel.logging")
      .required()
      .check(notificationFault);
  waitCommand.addOption("--timeout", *timeout, "Give up after this time, with exit status 1")
      .typeName("SECONDS");
  context.addJsonOption(waitCommand);
  waitCommand.onRun([&context, name, timeout] { wait(context, *name, *timeout); });

  const Command postCommand = group.addCommand("post", "Post a notification");
  postCommand.addOption("NAME", *name, "The notification").required().check(notificationFault);
  context.addJsonOption(postCommand);
  postCommand.onRun([&context, name] { post(context, *name); });
}

}  // namespace tavrel

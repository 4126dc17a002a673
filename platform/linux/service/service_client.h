// The client side of a named service, for tools and tests.
//
//   auto client = ServiceClient::connect(root, "com.norvane.tallied.tavrel");
//   if (client) client->send({{"operation", 0}});
#pragma once

#include <string_view>

#include "base/expected.h"
#include "base/plist.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/device_root.h"

namespace tavrel {

/// Closes the connection when released; the service still receives everything that was sent.
class ServiceClient {
 public:
  static Expected<ServiceClient> connect(const DeviceRoot& root, std::string_view name);

  /// Messages arrive in the order of sending. Fails when the service takes nothing for 30 seconds.
  /// There is no answer: success means that the kernel holds the message.
  Status send(const plist::Dictionary& message);

  /// The connected socket.
  int get() const { return socket_.get(); }

 private:
  explicit ServiceClient(Descriptor socket) : socket_(std::move(socket)) {}
  Descriptor socket_;
};

}  // namespace tavrel

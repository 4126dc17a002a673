// Messages of the named service, both ways: one property-list dictionary each.
//
// A message of at most `limits::kPacketBytes` is the content of one packet, in either encoding. A
// larger one travels in one memory file of at most `limits::kMessageFileBytes`, passed as the only
// descriptor of a packet that is otherwise empty. The file must be sealed against shrinking,
// growing and writing, so that it cannot change while it is read. Messages are not answered.
//
//   auto received = receiveMessage(socket, buffer);
//   if (auto* message = std::get_if<plist::Dictionary>(&received)) use(*message);
#pragma once

#include <variant>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// The dictionary in a message's bytes; the error says why there is none.
Expected<plist::Dictionary> decodeMessage(ByteSpan bytes);

/// No packet has come; the next call may find one.
struct NoMessage {};
/// The other end has closed, and everything it sent has been received.
struct ConnectionClosed {};

/// `Error` is a packet that is not a message, or a failed connection; drop the peer.
using Received = std::variant<plist::Dictionary, NoMessage, ConnectionClosed, Error>;

/// Receives one packet of a sequenced-packet socket, without waiting. `buffer` must hold
/// `limits::kPacketBytes`. All descriptors that come with the packet are closed.
Received receiveMessage(int socket, MutableByteSpan buffer);

/// Sends one message, waiting as long as the socket's send timeout says while the receiver's
/// buffer is full.
Status sendMessage(int socket, const plist::Dictionary& message);

}  // namespace tavrel

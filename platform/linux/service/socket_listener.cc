#include "platform/linux/service/socket_listener.h"

#include <cerrno>
#include <sys/timerfd.h>
#include <unistd.h>
#include <utility>
#include <variant>

#include "base/limits.h"
#include "base/system_text.h"
#include "platform/linux/service/service_message.h"

namespace tavrel {

namespace {

/// How long new peers wait when the system is short of descriptors or memory.
constexpr itimerspec kRetry{.it_interval = {0, 0}, .it_value = {1, 0}};

}  // namespace

class SocketListener::Peer final : public PeerConnection {
 public:
  Peer(SocketListener& listener, std::uint64_t id, Descriptor socket, const ucred& user)
      : listener_(listener), id_(id), user_(user), socket_(std::move(socket)) {}

  void setEventHandler(EventHandler handler) override { handler_ = std::move(handler); }

  void resume() override {
    if (source_) return;
    auto source = listener_.loop_.watch(socket_.get(), [this] { return receive(); });
    hasFailed_ = !source;
    if (source) {
      source_ = *std::move(source);
    } else {
      listener_.refusals_.write(dropped(source.error().message));
    }
  }

  bool hasFailed() const { return hasFailed_; }

  /// Makes the end of the peer count as an event too.
  void count() { counts_ = true; }

 private:
  /// May destroy the peer.
  Activity receive() {
    Received received = receiveMessage(
        socket_.get(), MutableByteSpan(listener_.buffer_.get(), limits::kPacketBytes));
    if (std::holds_alternative<NoMessage>(received)) return Activity::Nothing;
    if (const auto* message = std::get_if<plist::Dictionary>(&received)) {
      listener_.silentInARow_ = 0;
      counts_ = true;
      if (handler_) handler_(*message);
      return Activity::Event;
    }
    if (const auto* error = std::get_if<Error>(&received)) {
      listener_.refusals_.write(dropped(error->message));
    }
    const Activity activity = counts_ ? Activity::Event : Activity::Nothing;
    if (handler_) handler_(plist::Value());
    listener_.release(id_);
    return activity;
  }

  std::string dropped(std::string_view why) const {
    return format("%s: dropped peer %d (user %u): %s", listener_.name_, user_.pid, user_.uid, why);
  }

  SocketListener& listener_;
  std::uint64_t id_;
  ucred user_;
  EventHandler handler_;
  bool counts_ = false;  // its end is an event
  bool hasFailed_ = false;
  Descriptor socket_;
  LinuxEventLoop::Source source_;  // ends before its descriptor
};

SocketListener::SocketListener(std::string name, ServiceSocket socket, LinuxEventLoop& loop,
                               SystemLog& log)
    : name_(std::move(name)),
      loop_(loop),
      log_(log),
      refusals_(log),
      socket_(std::move(socket)),
      buffer_(std::make_unique_for_overwrite<std::byte[]>(limits::kPacketBytes)),
      retryTimer_(timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK)) {}

SocketListener::~SocketListener() = default;

void SocketListener::resume() {
  if (source_) return;
  if (!retry_ && retryTimer_) {
    auto retry = loop_.watch(retryTimer_.get(), [this] { return tryAgain(); });
    if (retry) retry_ = *std::move(retry);
  }
  auto source = loop_.watch(socket_.get(), [this] { return acceptPeer(); });
  if (source) {
    source_ = *std::move(source);
  } else {
    log_.log(LogLevel::Error, "%s: %s", name_, source.error().message);
  }
}

void SocketListener::pause() {
  source_.stop();
  paused_ = true;
}

void SocketListener::endPause() {
  if (std::exchange(paused_, false)) resume();
}

LinuxEventLoop::Activity SocketListener::tryAgain() {
  std::uint64_t expirations = 0;
  while (read(retryTimer_.get(), &expirations, sizeof expirations) > 0) {
  }
  if (peers_.size() < limits::kServicePeers) endPause();
  return Activity::Nothing;
}

void SocketListener::acceptFailed(int code) {
  switch (code) {
    case EAGAIN:
    case EINTR:
    case ECONNABORTED:
    case EACCES:
    case EPERM:
      return;  // about one peer, which has left
    case EMFILE:
    case ENFILE:
    case ENOBUFS:
    case ENOMEM:
      pause();
      timerfd_settime(retryTimer_.get(), 0, &kRetry, nullptr);
      if (!std::exchange(isShort_, true)) {
        refusals_.write(
            format("%s: new peers wait, tried each second: %s", name_, systemText(code)));
      }
      return;
    default:
      source_.stop();
      log_.log(LogLevel::Error, "%s: no further peers are taken: %s; restart the service", name_,
               systemText(code));
  }
}

bool SocketListener::admits(const ucred& user) {
  const uid_t own = geteuid();
  if (user.uid == 0 || user.uid == own) return true;
  refusals_.write(format("%s: refused peer %d (user %u): only root and user %u may use the service",
                         name_, user.pid, user.uid, own));
  return false;
}

LinuxEventLoop::Activity SocketListener::acceptPeer() {
  Descriptor socket(accept4(socket_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
  if (!socket) {
    acceptFailed(errno);
    return Activity::Nothing;
  }
  isShort_ = false;
  ucred user{};
  socklen_t size = sizeof user;
  if (getsockopt(socket.get(), SOL_SOCKET, SO_PEERCRED, &user, &size) != 0 || !admits(user)) {
    return Activity::Nothing;
  }

  const std::uint64_t id = ++lastPeerId_;
  const auto& peer =
      peers_.emplace(id, std::make_unique<Peer>(*this, id, std::move(socket), user)).first->second;
  if (peers_.size() == limits::kServicePeers) {
    pause();
    refusals_.write(format("%s: new peers wait until one leaves: there are %llu", name_,
                           std::uint64_t{peers_.size()}));
  }
  if (peerHandler_) peerHandler_(*peer);
  if (peer->hasFailed()) {
    release(id);
    return Activity::Nothing;
  }
  if (silentInARow_ == limits::kSilentConnections) return Activity::Nothing;
  ++silentInARow_;
  peer->count();
  return Activity::Event;
}

void SocketListener::release(std::uint64_t peerId) {
  peers_.erase(peerId);
  endPause();
}

}  // namespace tavrel

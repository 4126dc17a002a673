// Servers for an uploader: Debian's nginx with the documented
// configuration, and a scripted one.
#pragma once

#include <arpa/inet.h>
#include <atomic>
#include <signal.h>
#include <sys/socket.h>
#include <thread>

#include "base/base64.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/digests.h"
#include "tests/devices/temporary_root.h"

namespace tavrel {

/// A socket that listens on a free port of 127.0.0.1.
inline Descriptor listenAtFreePort(int& port) {
  Descriptor listener(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address{AF_INET, 0, {htonl(INADDR_LOOPBACK)}, {}};
  socklen_t size = sizeof address;
  auto* const plain = reinterpret_cast<sockaddr*>(&address);
  EXPECT_EQ(bind(listener.get(), plain, size) + listen(listener.get(), 16), 0);
  getsockname(listener.get(), plain, &size);
  port = ntohs(address.sin_port);
  return listener;
}

inline void replaceAll(std::string& text, std::string_view from, std::string_view to) {
  for (std::size_t at = 0; (at = text.find(from, at)) != text.npos; at += to.size())
    text.replace(at, from.size(), to);
}

class Nginx {
 public:
  Nginx() {
    listenAtFreePort(port);
    std::string site = contentOf(TAVREL_EXAMPLES "/upload/nginx.conf");
    replaceAll(site, "listen 443", "listen 127.0.0.1:" + std::to_string(port));
    replaceAll(site, "/etc/tavrel-server", folder);
    replaceAll(site, "/srv/tavrel", folder + "/srv");
    replaceAll(site, "/var/log/nginx", folder);
    std::string main = geteuid() == 0 ? "user root;" : "";
    main += "daemon off; pid nginx.pid; events {} http { access_log off;";
    for (const std::string name : {"client_body", "proxy", "fastcgi", "uwsgi", "scgi"})
      main += name + "_temp_path tmp-" + name + ";";
    root.write("/nginx.conf", main + site + "}");
    process = fork();
    if (process == 0) {
      execlp("sh", "sh", "-c", kStart, folder.c_str(), nullptr);
      _exit(127);
    }
    // nginx listens before it writes this file.
    while (!std::filesystem::exists(folder + "nginx.pid")) {
      if (waitpid(process, nullptr, WNOHANG) != 0)
        throw std::runtime_error("nginx has ended: " + contentOf(folder + "error.log"));
      usleep(2000);
    }
  }
  ~Nginx() { end(); }
  /// Ends the server, which completes its log, and returns the log.
  std::string accessLog() {
    end();
    return contentOf(folder + "tavrel-upload.log");
  }

  const TemporaryRoot root;
  const std::string folder = root.root.path("/");
  int port = 0;

 private:
  // Certificates of two authorities, of the server 127.0.0.1, of a device, and one signed with the
  // device's key; then nginx.
  static constexpr const char* kStart = R"(cd "$0" && mkdir srv
    make() {
      N=$1; shift
      openssl req -x509 -days 2 -nodes -newkey ec -pkeyopt ec_paramgen_curve:P-256 \
        -out "$N.crt" -keyout "$N.key" "$@" 2>>openssl.log
    }
    signed="-CA ca.crt -CAkey ca.key -addext basicConstraints=critical,CA:FALSE"
    make ca -subj /CN=ca && cp ca.crt devices-authority.crt && make other -subj /CN=ca &&
      make server -subj /CN=s $signed -addext subjectAltName=IP:127.0.0.1 &&
      make device -subj /CN=device-7/O=Example,CN=other $signed &&
      make forged -subj /CN=device-8 -CA device.crt -CAkey device.key &&
      cat device.crt >>forged.crt &&
      PATH=$PATH:/usr/sbin exec nginx -p "$0" -c nginx.conf -e error.log)";
  void end() {
    if (process == 0) return;
    kill(process, SIGQUIT);
    waitpid(std::exchange(process, 0), nullptr, 0);
  }
  pid_t process = 0;
};

/// Receives each request completely and answers with the text from `reply`, in which "DIGEST"
/// stands for the digest of the content. An empty text closes the connection.
class ScriptedServer {
 public:
  using Reply = std::function<std::string(const std::string& request)>;
  explicit ScriptedServer(Reply reply) : reply_(std::move(reply)), thread_([this] { serve(); }) {}
  ~ScriptedServer() {
    shutdown(listener_.get(), SHUT_RDWR);
    thread_.join();
  }
  std::string url() const { return "http://127.0.0.1:" + std::to_string(port_) + "/logs"; }

  /// Waits until the thread itself waits, holding no lock that a forked process would need.
  void settle() const {
    while (!isIdle_)
      sched_yield();
  }

  std::atomic<int> connections = 0;
  std::atomic<bool> closesAfterAnswer = false;
  std::atomic<bool> readsWhole = true;

  static std::string valueOf(const std::string& request, const std::string& header) {
    const std::size_t at = request.find(header + ": ");
    if (at == request.npos) return {};
    const std::size_t begin = at + header.size() + 2;
    return request.substr(begin, request.find('\r', at) - begin);
  }

 private:
  void serve() {
    while (true) {
      isIdle_ = true;
      const Descriptor client(accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
      isIdle_ = false;
      if (!client) return;
      ++connections;
      while (answerOne(client.get())) {
      }
    }
  }
  bool answerOne(int client) {
    std::string request;
    std::size_t body = 0;
    for (std::size_t wanted = std::string::npos; request.size() < wanted;) {
      char piece[65536];
      const ssize_t size = read(client, piece, sizeof piece);
      if (size <= 0) return false;
      request.append(piece, static_cast<std::size_t>(size));
      const std::size_t head = request.find("\r\n\r\n");
      if (head == request.npos) continue;
      body = head + 4;
      wanted = readsWhole ? body + std::stoul("0" + valueOf(request, "Content-Length")) : 0;
    }
    std::string answer = reply_(request);
    std::string digest = "sha-256=:";
    appendBase64(digest, sha256(asBytes(request).subspan(body)));
    replaceAll(answer, "DIGEST", digest + ":");
    return !answer.empty() && send(client, answer.data(), answer.size(), MSG_NOSIGNAL) > 0 &&
           !closesAfterAnswer;
  }

  Reply reply_;
  int port_ = 0;
  std::atomic<bool> isIdle_ = false;
  Descriptor listener_ = listenAtFreePort(port_);
  std::thread thread_;
};

}  // namespace tavrel

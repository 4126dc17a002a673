// Servers for an uploader: Debian's nginx with the configuration that is documented, and one that
// answers as it is told.
#pragma once

#include <arpa/inet.h>
#include <atomic>
#include <functional>
#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <thread>

#include "platform/linux/files/descriptor.h"
#include "tests/platform/temporary_root.h"

namespace tavrel {

/// A socket that listens at a free port of 127.0.0.1.
inline Descriptor listenAtFreePort(int& port) {
  Descriptor listener(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t size = sizeof address;
  auto* const plain = reinterpret_cast<sockaddr*>(&address);
  EXPECT_EQ(bind(listener.get(), plain, size), 0);
  EXPECT_EQ(listen(listener.get(), 16), 0);
  getsockname(listener.get(), plain, &size);
  port = ntohs(address.sin_port);
  return listener;
}

inline void replaceAll(std::string& text, std::string_view from, std::string_view to) {
  for (std::size_t at = 0; (at = text.find(from, at)) != text.npos; at += to.size())
    text.replace(at, from.size(), to);
}

inline void shell(const std::string& command) {
  ASSERT_EQ(std::system((command + " 2>&1").c_str()), 0) << command;  // NOLINT(cert-env33-c)
}

class Nginx {
 public:
  Nginx() {
    // Self-signed: another authority; signed: the server for 127.0.0.1, and a device.
    const std::string request = "cd '" + folder +
                                "' && openssl req -x509 -days 2 -nodes -newkey ec "
                                "-pkeyopt ec_paramgen_curve:P-256 -out $N.crt -keyout $N.key ";
    shell("N=ca; " + request + "-subj /CN=ca; N=other; " + request + "-subj /CN=ca; N=server; " +
          request +
          "-subj /CN=s -CA ca.crt -CAkey ca.key -addext subjectAltName=IP:127.0.0.1; "
          "N=device; " +
          request +
          "-subj '/O=Example/CN=device-7' -CA ca.crt -CAkey ca.key; "
          "cp ca.crt devices-authority.crt; mkdir srv");
    listenAtFreePort(port);
    std::string site = contentOf(TAVREL_EXAMPLES "/upload/nginx.conf");
    replaceAll(site, "listen 443", "listen 127.0.0.1:" + std::to_string(port));
    replaceAll(site, "/etc/tavrel-server", folder);
    replaceAll(site, "/srv/tavrel", folder + "/srv");
    replaceAll(site, "/var/log/nginx", folder);
    std::string main = geteuid() == 0 ? "user root;" : "";
    main += "daemon off; pid nginx.pid; events {} http {\n";
    for (const char* name : {"client_body", "proxy", "fastcgi", "uwsgi", "scgi"})
      main += std::string(name) + "_temp_path tmp-" + name + ";\n";
    root.write("/nginx.conf", main + "access_log off;\n" + site + "}");
    process = fork();
    if (process == 0) {
      execlp("nginx", "nginx", "-p", folder.c_str(), "-c", "nginx.conf", "-e", "error.log",
             nullptr);
      _exit(127);
    }
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    while (waitpid(process, nullptr, WNOHANG) == 0) {
      const Descriptor client(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
      if (connect(client.get(), reinterpret_cast<sockaddr*>(&address), sizeof address) == 0) return;
      usleep(2000);
    }
    ADD_FAILURE() << "nginx has ended: " << contentOf(folder + "/error.log");
  }
  ~Nginx() { end(); }
  /// Once it has ended, which completes its log.
  Lines accessLog() {
    end();
    Lines lines;
    std::ifstream file(folder + "/tavrel-upload.log");
    for (std::string line; std::getline(file, line);)
      lines.push_back(line);
    return lines;
  }

  const TemporaryRoot root;
  const std::string folder = root.root.path("");
  int port = 0;

 private:
  void end() {
    if (process == 0) return;
    kill(process, SIGQUIT);
    waitpid(std::exchange(process, 0), nullptr, 0);
  }
  pid_t process = 0;
};

/// Takes each request whole and answers with the text that `answer` gives, in which "DIGEST" stands
/// for the request's own. An empty one closes the connection.
class ScriptedServer {
 public:
  using Reply = std::function<std::string(const std::string& request)>;
  explicit ScriptedServer(Reply reply) : reply_(std::move(reply)) {
    thread_ = std::thread([this] { serve(); });
  }
  ~ScriptedServer() {
    isOver_ = true;
    thread_.join();
  }
  std::string url() const { return "http://127.0.0.1:" + std::to_string(port_) + "/logs"; }

  std::atomic<int> connections = 0;
  std::atomic<bool> closesAfterAnswer = false;

 private:
  bool isReadable(int descriptor) const {
    pollfd wanted{descriptor, POLLIN, 0};
    while (!isOver_)
      if (poll(&wanted, 1, 5) > 0) return true;
    return false;
  }
  void serve() {
    while (isReadable(listener_.get())) {
      const Descriptor client(accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
      ++connections;
      while (answerOne(client.get())) {
      }
    }
  }
  static std::string valueOf(const std::string& request, const std::string& header) {
    const std::size_t at = request.find(header + ": ");
    if (at == request.npos) return {};
    return request.substr(at + header.size() + 2, request.find('\r', at) - at - header.size() - 2);
  }
  bool answerOne(int client) {
    std::string request;
    std::size_t wanted = std::string::npos;
    while (request.size() < wanted) {
      char piece[65536];
      if (!isReadable(client)) return false;
      const ssize_t size = read(client, piece, sizeof piece);
      if (size <= 0) return false;
      request.append(piece, static_cast<std::size_t>(size));
      const std::size_t head = request.find("\r\n\r\n");
      if (head != request.npos)
        wanted = head + 4 + std::stoul("0" + valueOf(request, "Content-Length"));
    }
    std::string answer = reply_(request);
    replaceAll(answer, "DIGEST", valueOf(request, "Content-Digest"));
    if (answer.empty()) return false;
    return send(client, answer.data(), answer.size(), MSG_NOSIGNAL) > 0 && !closesAfterAnswer;
  }

  Reply reply_;
  int port_ = 0;
  std::atomic<bool> isOver_ = false;
  Descriptor listener_ = listenAtFreePort(port_);
  std::thread thread_;
};

}  // namespace tavrel

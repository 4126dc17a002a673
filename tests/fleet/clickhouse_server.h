// Debian's ClickHouse server as a separate process, in a temporary folder.
#pragma once

#include <fcntl.h>
#include <stdlib.h>

#include "tests/devices/servers.h"
#include "tests/devices/temporary_root.h"

namespace tavrel::fleet {

class ClickhouseServer {
 public:
  /// `pair` has the ports of servers that form a cluster "pair" with this one.
  explicit ClickhouseServer(const std::vector<int>& pair = {}) {
    listenAtFreePort(port);
    if (!pair.empty()) nativePort = pair[0];
    if (nativePort == 0) listenAtFreePort(nativePort);
    std::string shards;
    for (const int other : pair)
      shards += "<shard><replica><host>127.0.0.1</host><port>" + std::to_string(other) +
                "</port></replica></shard>";
    root.write("/config.xml",
               "<yandex><logger><level>warning</level><log>" + folder + "log</log><errorlog>" +
                   folder + "errors</errorlog></logger><http_port>" + std::to_string(port) +
                   "</http_port><tcp_port>" + std::to_string(nativePort) +
                   "</tcp_port><listen_host>127.0.0.1</listen_host><path>" + folder +
                   "data/</path><tmp_path>" + folder +
                   "tmp/</tmp_path><users_config>users.xml</users_config>"
                   "<default_profile>default</default_profile>"
                   "<default_database>default</default_database>"
                   "<timezone>Pacific/Kiritimati</timezone>"
                   "<mark_cache_size>16777216</mark_cache_size><remote_servers><pair>" +
                   shards + "</pair></remote_servers></yandex>");
    root.write("/users.xml",
               "<yandex><profiles><default/></profiles><quotas><default/></quotas><users>" +
                   user("default", "") + user("fleet", "se'cret") + "</users></yandex>");
    start();
  }
  ~ClickhouseServer() { end(); }

  void start() {
    process = fork();
    if (process == 0) {
      const int out = open((folder + "output").c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
      dup2(out, STDOUT_FILENO);
      dup2(out, STDERR_FILENO);
      execlp("clickhouse-server", "clickhouse-server",
             ("--config-file=" + folder + "config.xml").c_str(), nullptr);
      _exit(127);
    }
    while (
        system(("curl -sf http://127.0.0.1:" + std::to_string(port) + "/ping >" + folder + "ping")
                   .c_str()) != 0) {
      if (waitpid(process, nullptr, WNOHANG) != 0)
        throw std::runtime_error("clickhouse-server has ended: " + contentOf(folder + "output"));
      usleep(10'000);
    }
  }
  void end(int signal = SIGKILL) {
    if (process == 0) return;
    kill(process, signal);
    waitpid(std::exchange(process, 0), nullptr, 0);
  }

  std::string ask(const std::string& statement, const std::string& database = "default") const {
    root.write("/statement", statement);
    EXPECT_EQ(system(("cd " + folder + " && curl -sfS http://127.0.0.1:" + std::to_string(port) +
                      "/?database=" + database + " -d @statement >answer")
                         .c_str()),
              0);
    return contentOf(folder + "answer");
  }
  std::string address(const std::string& database, const std::string& user = "") const {
    return "clickhouse://" + user + "127.0.0.1:" + std::to_string(port) + "/" + database;
  }

  const TemporaryRoot root;
  const std::string folder = root.root.path("/");
  int port = 0;
  int nativePort = 0;

 private:
  static std::string user(const std::string& name, const std::string& password) {
    return "<" + name + "><password>" + password +
           "</password><networks><ip>127.0.0.1</ip></networks><profile>default</profile>"
           "<quota>default</quota></" +
           name + ">";
  }
  pid_t process = 0;
};

}  // namespace tavrel::fleet

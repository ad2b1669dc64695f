// faultbox-canhub: a CAN bus over TCP. Clients speak the socketcand
// raw-mode protocol ("< open bus >", "< rawmode >", "< send ... >"); every
// frame a client sends goes to every other client in raw mode on the same
// bus name as "< frame ... >". The first line on standard output is the port
// the hub listens on, so that a caller that asked for port 0 learns it.
#include <fcntl.h>
#include <netdb.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <list>
#include <string>
#include <vector>

#include "platform/CanAccess.h"
#include "platform/can/CanDrivers.h"
#include "platform/can/SocketcandProtocol.h"

namespace {

using namespace faultbox;

// A client that does not read what it is sent is dropped before its
// backlog eats the hub's memory.
constexpr std::size_t kMaxBacklog = 4u << 20;

int gStopPipe[2] = {-1, -1};

void OnStopSignal(int) {
  const char c = 0;
  [[maybe_unused]] ssize_t n = ::write(gStopPipe[1], &c, 1);
}

struct Client {
  int fd = -1;
  SocketcandParser parser;
  std::string backlog;  // bytes not yet taken by the socket
  std::string bus;
  bool raw = false;
  bool dead = false;
};

class Hub {
 public:
  Hub(int listener, bool trace) : listener_(listener), trace_(trace) {}

  int Run() {
    for (;;) {
      std::vector<pollfd> fds{{gStopPipe[0], POLLIN, 0}, {listener_, POLLIN, 0}};
      std::vector<Client*> polled;
      for (Client& c : clients_) {
        fds.push_back({c.fd, static_cast<short>(POLLIN | (c.backlog.empty() ? 0 : POLLOUT)), 0});
        polled.push_back(&c);
      }
      if (::poll(fds.data(), fds.size(), -1) < 0) {
        if (errno == EINTR) continue;
        std::perror("poll");
        return 1;
      }
      if (fds[0].revents != 0) return 0;
      if (fds[1].revents & POLLIN) Accept();
      for (std::size_t i = 0; i < polled.size(); ++i) {
        Client& c = *polled[i];
        const short ev = fds[i + 2].revents;
        if (!c.dead && (ev & POLLOUT)) Flush(c);
        if (!c.dead && (ev & (POLLIN | POLLHUP | POLLERR))) Read(c);
      }
      clients_.remove_if([](const Client& c) {
        if (c.dead) ::close(c.fd);
        return c.dead;
      });
    }
  }

 private:
  void Accept() {
    const int fd = ::accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
    if (fd < 0) return;
    const int one = 1;
    ::setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &one, sizeof one);
    clients_.emplace_back();
    clients_.back().fd = fd;
    Queue(clients_.back(), "< hi >");
  }

  void Read(Client& c) {
    char buf[4096];
    const ssize_t n = ::recv(c.fd, buf, sizeof buf, 0);
    if (n < 0 && (errno == EINTR || errno == EAGAIN)) return;
    if (n <= 0) {
      c.dead = true;
      return;
    }
    c.parser.Feed(std::string_view(buf, static_cast<std::size_t>(n)));
    SocketcandElement element;
    std::string error;
    for (;;) {
      const auto status = c.parser.Next(&element, &error);
      if (status == SocketcandParser::Status::kNeedMore) break;
      if (status == SocketcandParser::Status::kError)
        Queue(c, FormatSocketcandError(error));
      else
        Handle(c, element);
      if (c.dead) return;
    }
  }

  void Handle(Client& c, const SocketcandElement& e) {
    if (e.Is("open")) {
      if (e.words.size() != 2 || !IsValidSocketcandBusName(e.words[1]))
        return Queue(c, FormatSocketcandError("bad bus name"));
      c.bus = e.words[1];
      c.raw = false;
      return Queue(c, "< ok >");
    }
    if (e.Is("rawmode")) {
      if (c.bus.empty()) return Queue(c, FormatSocketcandError("open a bus first"));
      c.raw = true;
      return Queue(c, "< ok >");
    }
    if (e.Is("echo")) return Queue(c, "< echo >");
    if (!e.Is("send")) return Queue(c, FormatSocketcandError("unknown command " + e.words[0]));
    if (!c.raw) return Queue(c, FormatSocketcandError("not in raw mode"));
    CanFrameRecord frame;
    std::string error;
    if (!ParseSocketcandSend(e, &frame, &error)) return Queue(c, FormatSocketcandError(error));
    frame.timeStamp = CanTimeStampNow();
    const std::string text = FormatSocketcandFrame(frame);
    for (Client& other : clients_)
      if (&other != &c && !other.dead && other.raw && other.bus == c.bus) Queue(other, text);
    if (trace_) {
      std::printf("%s\n", CanFrameTrace::FormatLine(frame, c.bus).c_str());
      std::fflush(stdout);
    }
  }

  void Queue(Client& c, const std::string& text) {
    c.backlog += text;
    Flush(c);
    if (c.backlog.size() > kMaxBacklog) c.dead = true;
  }

  void Flush(Client& c) {
    while (!c.backlog.empty()) {
      const ssize_t n = ::send(c.fd, c.backlog.data(), c.backlog.size(), MSG_NOSIGNAL);
      if (n < 0 && errno == EINTR) continue;
      if (n < 0 && errno == EAGAIN) return;
      if (n <= 0) {
        c.dead = true;
        return;
      }
      c.backlog.erase(0, static_cast<std::size_t>(n));
    }
  }

  int listener_;
  bool trace_;
  std::list<Client> clients_;  // a list: Queue() keeps references while others are added
};

int Listen(const std::string& bind, int port, std::string* error) {
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  hints.ai_flags = AI_PASSIVE | AI_NUMERICSERV;
  addrinfo* list = nullptr;
  const std::string service = std::to_string(port);
  if (int rc = ::getaddrinfo(bind.c_str(), service.c_str(), &hints, &list); rc != 0) {
    *error = "cannot resolve " + bind + ": " + ::gai_strerror(rc);
    return -1;
  }
  int fd = -1;
  for (addrinfo* ai = list; ai != nullptr && fd < 0; ai = ai->ai_next) {
    fd = ::socket(ai->ai_family, ai->ai_socktype | SOCK_CLOEXEC, ai->ai_protocol);
    if (fd < 0) continue;
    const int one = 1;
    ::setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &one, sizeof one);
    if (::bind(fd, ai->ai_addr, ai->ai_addrlen) != 0 || ::listen(fd, 64) != 0) {
      *error = "cannot listen on " + bind + " port " + service + ": " + std::strerror(errno);
      ::close(fd);
      fd = -1;
    }
  }
  ::freeaddrinfo(list);
  return fd;
}

int BoundPort(int fd) {
  sockaddr_storage address{};
  socklen_t len = sizeof address;
  if (::getsockname(fd, reinterpret_cast<sockaddr*>(&address), &len) != 0) return -1;
  if (address.ss_family == AF_INET) return ntohs(reinterpret_cast<sockaddr_in*>(&address)->sin_port);
  if (address.ss_family == AF_INET6) return ntohs(reinterpret_cast<sockaddr_in6*>(&address)->sin6_port);
  return -1;
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app{"faultbox-canhub: a CAN bus over TCP for processes speaking the socketcand raw mode"};
  int port = kCanHubDefaultPort;
  std::string bind = "127.0.0.1";
  bool trace = false;
  app.add_option("--port", port, "TCP port to listen on; 0 picks a free one")
      ->check(CLI::Range(0, 65535))
      ->capture_default_str();
  app.add_option("--bind", bind, "Address to listen on")->capture_default_str();
  app.add_flag("--trace", trace, "Print every frame on standard output in candump log form");
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    const int code = app.exit(e);
    return code == 0 ? 0 : 2;
  }

  if (::pipe2(gStopPipe, O_CLOEXEC) != 0) {
    std::perror("pipe");
    return 1;
  }
  ::signal(SIGPIPE, SIG_IGN);
  struct sigaction stop {};
  stop.sa_handler = OnStopSignal;
  ::sigaction(SIGINT, &stop, nullptr);
  ::sigaction(SIGTERM, &stop, nullptr);

  std::string error;
  const int listener = Listen(bind, port, &error);
  if (listener < 0) {
    std::fprintf(stderr, "faultbox-canhub: %s\n", error.c_str());
    return 1;
  }
  std::printf("%d\n", BoundPort(listener));
  std::fflush(stdout);
  return Hub(listener, trace).Run();
}

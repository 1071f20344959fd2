#include "platform/loopbackserver.h"

#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace midebug {

TLoopbackConnection::~TLoopbackConnection() {
  if (FHandle >= 0)
    ::close(FHandle);
}

Int64 TLoopbackConnection::Read(void* Buffer, size_t Count) {
  for (;;) {
    const ssize_t Read = ::recv(FHandle, Buffer, Count, 0);
    if (Read >= 0 || errno != EINTR)
      return Read;
  }
}

bool TLoopbackConnection::Write(std::string_view Text) {
  while (!Text.empty()) {
    // MSG_NOSIGNAL: a client that has gone costs a failed write, not SIGPIPE.
    const ssize_t Written = ::send(FHandle, Text.data(), Text.size(), MSG_NOSIGNAL);
    if (Written < 0 && errno == EINTR)
      continue;
    if (Written <= 0)
      return false;
    Text.remove_prefix(static_cast<size_t>(Written));
  }
  return true;
}

void TLoopbackConnection::Shut() { ::shutdown(FHandle, SHUT_RDWR); }

TLoopbackServer::~TLoopbackServer() {
  if (FHandle >= 0)
    ::close(FHandle);
}

bool TLoopbackServer::Listen(int Port, std::string& Error) {
  if (Port < 0 || Port > 65535) {
    Error = "the port must be a number from 0 to 65535";
    return false;
  }
  FHandle = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (FHandle < 0) {
    Error = std::strerror(errno);
    return false;
  }
  const int On = 1;
  ::setsockopt(FHandle, SOL_SOCKET, SO_REUSEADDR, &On, sizeof(On));
  sockaddr_in Address{};
  Address.sin_family = AF_INET;
  Address.sin_port = htons(static_cast<uint16_t>(Port));
  // The loopback address only: whoever reaches the port can have programs run.
  Address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t Length = sizeof(Address);
  if (::bind(FHandle, reinterpret_cast<sockaddr*>(&Address), sizeof(Address)) != 0 || ::listen(FHandle, 1) != 0 ||
      ::getsockname(FHandle, reinterpret_cast<sockaddr*>(&Address), &Length) != 0) {
    Error = std::strerror(errno);
    ::close(FHandle);
    FHandle = -1;
    return false;
  }
  FPort = ntohs(Address.sin_port);
  return true;
}

std::unique_ptr<TLoopbackConnection> TLoopbackServer::Accept(std::chrono::milliseconds Timeout) {
  pollfd Waiting{FHandle, POLLIN, 0};
  if (::poll(&Waiting, 1, static_cast<int>(Timeout.count())) <= 0)
    return nullptr;
  const int Client = ::accept4(FHandle, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
  if (Client < 0)
    return nullptr;
  // Blocking from here on: the accepted socket must not inherit the flag.
  const int Flags = ::fcntl(Client, F_GETFL);
  ::fcntl(Client, F_SETFL, Flags & ~O_NONBLOCK);
  return std::make_unique<TLoopbackConnection>(Client);
}

} // namespace midebug

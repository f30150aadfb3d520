#include "services/kovawebd/http_server.h"

#include <arpa/inet.h>
#include <microhttpd.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <atomic>
#include <charconv>
#include <cstring>
#include <exception>
#include <optional>
#include <string>
#include <utility>

#include "common/error.h"
#include "common/log.h"
#include "services/kovawebd/work_threads.h"
#include "services/support/listening_socket.h"

namespace ferrox::web {

namespace {

constexpr size_t kHeaderMaxBytes = 16U << 10;
/// For the header as it comes and as it is parsed.
constexpr size_t kConnectionMemoryBytes = 40U << 10;
constexpr size_t kBodyMaxBytes = 64U << 10;
/// A client that sends more than this of a body that is refused is cut off.
constexpr size_t kBodyDiscardedMaxBytes = 1U << 20;
constexpr unsigned kTimeoutSec = 30;
constexpr unsigned kNetConnectionsMax = 256, kLocalConnectionsMax = 128, kAddressConnectionsMax = 64;
constexpr unsigned kThreads = 12;
constexpr size_t kWaitingMax = 128;

const Problem kBusy = {503, "too many requests are being answered; ask again in a second"};

/// One request from its first byte until its answer has gone or its connection ended. Handed to and fro between the
/// connection's thread and, while the connection is suspended, the one that answers.
struct Exchange {
  Request request = {};
  std::optional<Response> response = {};
  bool begun = false;
  size_t body_bytes = 0;  ///< what came, kept or not
};

MHD_Result KeepHeader(void* cls, MHD_ValueKind, const char* name, const char* value) {
  auto& request = *static_cast<Request*>(cls);
  const std::string text = value != nullptr ? value : "";
  if (strcasecmp(name, "Host") == 0) request.hosts.push_back(text);
  if (strcasecmp(name, "Origin") == 0) request.origins.push_back(text);
  if (strcasecmp(name, "Authorization") == 0) request.authorizations.push_back(text);
  return MHD_YES;
}

int DescriptorOf(MHD_Connection* connection) {
  const MHD_ConnectionInfo* info = MHD_get_connection_info(connection, MHD_CONNECTION_INFO_CONNECTION_FD);
  return info != nullptr ? info->connect_fd : -1;
}

/// Of this end, as people write it; an IPv4 address that came to a socket for both kinds as such.
std::string LocalAddressOf(int fd) {
  sockaddr_storage address = {};
  socklen_t size = sizeof(address);
  char text[INET6_ADDRSTRLEN] = {};
  if (getsockname(fd, reinterpret_cast<sockaddr*>(&address), &size) != 0) return "";
  if (address.ss_family == AF_INET) {
    (void)inet_ntop(AF_INET, &reinterpret_cast<const sockaddr_in*>(&address)->sin_addr, text, sizeof(text));
  } else if (address.ss_family == AF_INET6) {
    (void)inet_ntop(AF_INET6, &reinterpret_cast<const sockaddr_in6*>(&address)->sin6_addr, text, sizeof(text));
  }
  constexpr std::string_view kMapped = "::ffff:";
  const std::string_view found = text;
  const bool is_mapped = found.starts_with(kMapped) && found.find('.') != std::string_view::npos;
  return std::string(is_mapped ? found.substr(kMapped.size()) : found);
}

size_t HeaderBytes(MHD_Connection* connection) {
  const MHD_ConnectionInfo* info = MHD_get_connection_info(connection, MHD_CONNECTION_INFO_REQUEST_HEADER_SIZE);
  return info != nullptr ? info->header_size : 0;
}

/// Whether a body is announced that is longer than it may be.
bool AnnouncesTooMuch(MHD_Connection* connection) {
  const char* length = MHD_lookup_connection_value(connection, MHD_HEADER_KIND, MHD_HTTP_HEADER_CONTENT_LENGTH);
  if (length == nullptr) return false;
  uint64_t bytes = 0;
  const auto read = std::from_chars(length, length + strlen(length), bytes);
  return read.ec != std::errc() || bytes > kBodyMaxBytes;
}

/// What MHD_OPTION_UNESCAPE_CALLBACK calls: the target is decoded here and nowhere else (query_string.h).
size_t LeaveEscaped(void*, MHD_Connection*, char* text) { return strlen(text); }

MHD_Result Send(MHD_Connection* connection, const Response& response) {
  MHD_Response* made = MHD_create_response_from_buffer(response.body.size(), const_cast<char*>(response.body.data()),
                                                       MHD_RESPMEM_MUST_COPY);
  if (made == nullptr) return MHD_NO;
  (void)MHD_add_response_header(made, MHD_HTTP_HEADER_CONTENT_TYPE, response.type.c_str());
  (void)MHD_add_response_header(made, MHD_HTTP_HEADER_CACHE_CONTROL, "no-store");
  (void)MHD_add_response_header(made, "X-Content-Type-Options", "nosniff");
  for (const auto& [name, value] : response.headers) (void)MHD_add_response_header(made, name.c_str(), value.c_str());
  const MHD_Result queued = MHD_queue_response(connection, static_cast<unsigned>(response.status), made);
  MHD_destroy_response(made);
  return queued;
}

void* BeginExchange(void*, const char* target, MHD_Connection*) {
  auto* exchange = new Exchange;
  exchange->request.target = target;
  return exchange;
}

void EndExchange(void*, MHD_Connection*, void** state, MHD_RequestTerminationCode) {
  delete static_cast<Exchange*>(*state);
  *state = nullptr;
}

}  // namespace

class HttpServer::Impl {
 public:
  Impl(std::vector<Listener> listeners, Handler handler)
      : handler_(std::move(handler)), work_(kThreads, kWaitingMax), sockets_(listeners.size()) {
    unsigned nets = 0;
    for (const Listener& listener : listeners) nets += listener.is_local ? 0 : 1;
    for (size_t i = 0; i < listeners.size(); ++i) {
      sockets_[i].owner = this;
      sockets_[i].is_local = listeners[i].is_local;
      sockets_[i].daemon = Start(sockets_[i], std::move(listeners[i].fd),
                                 listeners[i].is_local ? kLocalConnectionsMax : kNetConnectionsMax / nets);
    }
  }
  ~Impl() {
    ends_ = true;
    work_.End();
    for (const Socket& socket : sockets_) {
      if (socket.daemon != nullptr) MHD_stop_daemon(socket.daemon);
    }
  }

 private:
  struct Socket {
    Impl* owner = nullptr;
    bool is_local = false;
    MHD_Daemon* daemon = nullptr;
  };

  static MHD_Daemon* Start(Socket& socket, base::UniqueFd fd, unsigned connections);
  static MHD_Result OnAccess(void* cls, MHD_Connection* connection, const char* url, const char* method,
                             const char* version, const char* data, size_t* size, void** state);

  MHD_Result Begin(const Socket& socket, MHD_Connection* connection, const char* method, Exchange& exchange);
  MHD_Result GiveAway(MHD_Connection* connection, Exchange& exchange);
  Response Answer(const Request& request) const;

  const Handler handler_;
  std::atomic<bool> ends_ = false;
  WorkThreads work_;
  std::vector<Socket> sockets_;
};

/// The library closes the socket in the end.
MHD_Daemon* HttpServer::Impl::Start(Socket& socket, base::UniqueFd fd, unsigned connections) {
  MHD_Daemon* daemon = MHD_start_daemon(
      MHD_USE_EPOLL_INTERNAL_THREAD | MHD_ALLOW_SUSPEND_RESUME, 0, nullptr, nullptr, &OnAccess, &socket,
      MHD_OPTION_LISTEN_SOCKET, fd.Get(), MHD_OPTION_CONNECTION_LIMIT, connections, MHD_OPTION_PER_IP_CONNECTION_LIMIT,
      kAddressConnectionsMax, MHD_OPTION_CONNECTION_TIMEOUT, kTimeoutSec, MHD_OPTION_CONNECTION_MEMORY_LIMIT,
      kConnectionMemoryBytes, MHD_OPTION_URI_LOG_CALLBACK, &BeginExchange, nullptr, MHD_OPTION_NOTIFY_COMPLETED,
      &EndExchange, nullptr, MHD_OPTION_UNESCAPE_CALLBACK, &LeaveEscaped, nullptr, MHD_OPTION_END);
  FERROX_FAIL_IF(daemon == nullptr, Error::kInternal, "libmicrohttpd does not start: " + ErrnoText());
  (void)fd.Release();
  return daemon;
}

/// Called by the connection's thread when the header is there, for each piece of the body, at its end, and when what
/// was suspended goes on.
MHD_Result HttpServer::Impl::OnAccess(void* cls, MHD_Connection* connection, const char*, const char* method,
                                      const char*, const char* data, size_t* size, void** state) {
  const Socket& socket = *static_cast<const Socket*>(cls);
  auto& exchange = *static_cast<Exchange*>(*state);
  if (!exchange.begun) return socket.owner->Begin(socket, connection, method, exchange);
  if (*size != 0) {
    exchange.body_bytes += *size;
    if (exchange.body_bytes <= kBodyMaxBytes) (void)exchange.request.body.append(data, *size);
    *size = 0;
    return exchange.body_bytes <= kBodyDiscardedMaxBytes ? MHD_YES : MHD_NO;
  }
  if (exchange.response.has_value()) return Send(connection, *exchange.response);
  if (exchange.body_bytes > kBodyMaxBytes) return Send(connection, ToResponse({413, "a body has at most 64 KiB"}));
  return socket.owner->GiveAway(connection, exchange);
}

/// Answers at once what is too long already; the connection ends with that.
MHD_Result HttpServer::Impl::Begin(const Socket& socket, MHD_Connection* connection, const char* method,
                                   Exchange& exchange) {
  exchange.begun = true;
  Request& request = exchange.request;
  request.method = method;
  (void)MHD_get_connection_values(connection, MHD_HEADER_KIND, &KeepHeader, &request);
  const int fd = DescriptorOf(connection);
  if (socket.is_local) {
    request.local_user = services::PeerOf(fd).uid;
  } else {
    request.local_address = LocalAddressOf(fd);
  }
  if (HeaderBytes(connection) > kHeaderMaxBytes) {
    return Send(connection, ToResponse({431, "the header of a request has at most 16 KiB"}));
  }
  if (AnnouncesTooMuch(connection)) return Send(connection, ToResponse({413, "a body has at most 64 KiB"}));
  return MHD_YES;
}

/// The connection is nobody's business until the answer is there.
MHD_Result HttpServer::Impl::GiveAway(MHD_Connection* connection, Exchange& exchange) {
  if (ends_) return Send(connection, ToResponse(kBusy));
  MHD_suspend_connection(connection);
  const bool given = work_.Give([this, connection, &exchange] {
    exchange.response = Answer(exchange.request);
    MHD_resume_connection(connection);
  });
  if (!given) {
    exchange.response = ToResponse(kBusy);
    MHD_resume_connection(connection);
  }
  return MHD_YES;
}

Response HttpServer::Impl::Answer(const Request& request) const {
  try {
    return handler_(request);
  } catch (const Problem& problem) {
    return ToResponse(problem);
  } catch (const std::exception&) {
    return ToResponse({500, "this request could not be answered"});
  }
}

HttpServer::HttpServer(std::vector<Listener> listeners, Handler handler)
    : impl_(std::make_unique<Impl>(std::move(listeners), std::move(handler))) {}

HttpServer::~HttpServer() = default;

}  // namespace ferrox::web

#include "services/support/frame_connection.h"

#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "base/descriptor_passing.h"

namespace ferrox::services {

std::optional<uint32_t> FrameConnection::BodyBytes() const {
  uint32_t length = 0;
  if (done_ < kHeaderBytes) return std::nullopt;
  memcpy(&length, header_.data(), kHeaderBytes);
  return length;
}

ssize_t FrameConnection::ReceiveBytes(Chunk& chunk, size_t size, bool takes_descriptors) {
  if (!takes_descriptors) return read(fd.Get(), chunk.data(), size);
  int received = -1;
  const ssize_t got = base::ReceiveWithDescriptors(fd.Get(), chunk.data(), size, &received, 1);
  if (received >= 0) {
    descriptor.Reset(received);
    peer.descriptor = received;
  }
  return got;
}

FrameConnection::Progress FrameConnection::Receive(const FrameServerOptions& options, Chunk& chunk) {
  for (;;) {
    const auto body_bytes = BodyBytes();
    const uint32_t limit_bytes = is_bound ? options.users.request_limit_bytes : options.request_limit_bytes;
    if (body_bytes && *body_bytes > limit_bytes) return Progress::kBroken;
    const size_t missing = body_bytes ? *body_bytes - body.size() : kHeaderBytes - done_;
    if (missing == 0) return Progress::kComplete;
    const ssize_t got = ReceiveBytes(chunk, std::min(missing, chunk.size()), options.takes_descriptors);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 && errno == EAGAIN) return Progress::kMore;
    if (got <= 0) return Progress::kBroken;
    if (body_bytes) {
      body.append(chunk.data(), static_cast<size_t>(got));
    } else {
      memcpy(header_.data() + done_, chunk.data(), static_cast<size_t>(got));
    }
    done_ += static_cast<size_t>(got);
    last_progress = SteadyClock::now();
  }
}

void FrameConnection::BeginSending(FrameReply reply) {
  const auto length = static_cast<uint32_t>(reply.body.size());
  memcpy(header_.data(), &length, kHeaderBytes);
  body = std::move(reply.body);
  sent_descriptor_ = std::move(reply.descriptor);
  state = State::kSending;
  done_ = 0;
  last_progress = SteadyClock::now();
}

void FrameConnection::BeginReceiving() {
  std::string().swap(body);
  state = State::kReceiving;
  done_ = 0;
}

/// With the descriptor, of which the peer then has a copy of its own.
bool FrameConnection::SendHeader() {
  if (!base::SendWithDescriptors(fd.Get(), {header_.data(), kHeaderBytes}, {sent_descriptor_.Get()})) return false;
  sent_descriptor_.Reset();
  done_ = kHeaderBytes;
  return true;
}

FrameConnection::Progress FrameConnection::Send() {
  if (sent_descriptor_.Valid() && !SendHeader()) return errno == EAGAIN ? Progress::kMore : Progress::kBroken;
  while (done_ < kHeaderBytes + body.size()) {
    const size_t of_header = std::min(done_, kHeaderBytes), of_body = done_ - of_header;
    iovec parts[] = {{header_.data() + of_header, kHeaderBytes - of_header},
                     {body.data() + of_body, body.size() - of_body}};
    msghdr message = {};
    message.msg_iov = parts;
    message.msg_iovlen = 2;
    const ssize_t put = sendmsg(fd.Get(), &message, MSG_NOSIGNAL);
    if (put < 0 && errno == EINTR) continue;
    if (put < 0 && errno == EAGAIN) return Progress::kMore;
    if (put < 0) return Progress::kBroken;
    done_ += static_cast<size_t>(put);
    last_progress = SteadyClock::now();
  }
  return Progress::kComplete;
}

}  // namespace ferrox::services

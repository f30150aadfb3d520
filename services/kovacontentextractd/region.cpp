#include "services/kovacontentextractd/region.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/sendfile.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

#include "services/kovacontentextractd/readers/reader.h"
#include "services/kovacontentextractd/readers/utf8.h"
#include "services/kovacontentextractd/worker_protocol.h"

namespace ferrox::extract {

namespace {

// A region is written by a worker that may be hostile while the daemon reads it, so the daemon never maps it: it copies
// by pread and sendfile, which a page that is taken away cannot fault.

constexpr unsigned kNeverExecuted = 8;  // MFD_NOEXEC_SEAL, of Linux 6.3
constexpr size_t kCharacterMaxBytes = 4;

/// A file in memory that can be sealed, and not be executed where the kernel knows that.
base::UniqueFd MakeMemory() {
  constexpr char kName[] = "kovacontentextractd";
  base::UniqueFd memory(memfd_create(kName, MFD_CLOEXEC | MFD_ALLOW_SEALING | kNeverExecuted));
  if (!memory.Valid() && errno == EINVAL) memory.Reset(memfd_create(kName, MFD_CLOEXEC | MFD_ALLOW_SEALING));
  return memory;
}

}  // namespace

base::UniqueFd MakeRegion() {
  base::UniqueFd region = MakeMemory();
  const bool made = region.Valid() && ftruncate(region.Get(), kRegionBytes) == 0 &&
                    fcntl(region.Get(), F_ADD_SEALS, F_SEAL_GROW | F_SEAL_SHRINK | F_SEAL_SEAL) == 0;
  return made ? std::move(region) : base::UniqueFd();
}

bool CopyText(int region, size_t bytes, const TextSink& sink) {
  if (bytes > Limits().text_bytes) return false;
  std::array<char, 65536> buffer;
  size_t read = 0, kept = 0;  // of the text; of the buffer, the beginning of a character whose end comes next
  while (read < bytes) {
    const size_t wanted = std::min(bytes - read, buffer.size() - kept);
    const ssize_t got = pread(region, buffer.data() + kept, wanted, static_cast<off_t>(read));
    if (got <= 0) return false;
    const std::string_view copied(buffer.data(), kept + static_cast<size_t>(got));
    const size_t valid = ValidUtf8Prefix(copied);
    if (valid > 0) sink(read - kept, copied.substr(0, valid));
    read += static_cast<size_t>(got);
    kept = copied.size() - valid;
    if (kept >= kCharacterMaxBytes) return false;
    memmove(buffer.data(), buffer.data() + valid, kept);
  }
  return kept == 0;
}

base::UniqueFd CopyAttachment(int region, size_t offset, size_t bytes) {
  base::UniqueFd memory = MakeMemory();
  auto from = static_cast<off_t>(offset);
  for (size_t left = memory.Valid() ? bytes : 0; left > 0;) {
    const ssize_t copied = sendfile(memory.Get(), region, &from, left);
    if (copied <= 0) return base::UniqueFd();
    left -= static_cast<size_t>(copied);
  }
  constexpr int kSeals = F_SEAL_GROW | F_SEAL_SHRINK | F_SEAL_WRITE | F_SEAL_SEAL;
  return memory.Valid() && fcntl(memory.Get(), F_ADD_SEALS, kSeals) == 0 ? std::move(memory) : base::UniqueFd();
}

void FreeAttachments(int region, size_t bytes) {
  (void)fallocate(region, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, kAttachmentsAt, static_cast<off_t>(bytes));
}

}  // namespace ferrox::extract

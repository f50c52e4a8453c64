#include "host/transport/transfernote.h"

#include <atomic>
#include <memory>
#include <mutex>

namespace {

std::mutex observer_mutex;
std::shared_ptr<const TransferObserver> observer;  // guarded by observer_mutex
std::atomic<bool> observed{false};                // cheap test on the transfer path

}  // namespace

void SetTransferObserver(TransferObserver next) {
  std::lock_guard<std::mutex> lock(observer_mutex);
  observed = static_cast<bool>(next);
  observer = next ? std::make_shared<const TransferObserver>(std::move(next)) : nullptr;
}

void NoteTransfer(const std::string& host, int port, bool ok, const std::string& cause) {
  if (!observed) return;
  std::shared_ptr<const TransferObserver> call;
  {
    std::lock_guard<std::mutex> lock(observer_mutex);
    call = observer;
  }
  if (call) (*call)(TransferOutcome{host, port, ok, ok ? std::string() : cause});
}

std::string HttpStatusCause(int status) {
  const std::string code = "HTTP " + std::to_string(status);
  switch (status) {
    case 401: return code + " (credentials refused)";
    case 403: return code + " (access forbidden)";
    case 404: return code + " (no such path on the camera)";
    default: return status >= 500 ? code + " (camera error)" : code;
  }
}

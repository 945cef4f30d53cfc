#include "keld/sync/SharedAccess.h"

#include <utility>

namespace droxa::keld {

namespace {
constexpr int kDeepest = 4096;  // and the end of cycles
}  // namespace

bool SharedAccess::isWritable(const std::string &record, const std::string &parent) const {
  bool isAnyKnown = false;
  std::string at = record;
  std::string above = parent;
  for (int depth = 0; depth < kDeepest && at != scope_.top() && !at.empty(); ++depth) {
    const auto access = store_.accessByRoot(at);
    if (access && access->isWritable) return true;
    isAnyKnown = isAnyKnown || access;
    if (above.empty()) {
      const auto row = store_.byRecord(at);
      if (row) above = row->parent;
    }
    at = std::exchange(above, "");
  }
  return !isAnyKnown;
}

std::optional<SyncRow> SharedAccess::topOf(const SyncRow &row) const {
  SyncRow at = row;
  for (int depth = 0; depth < kDeepest; ++depth) {
    if (at.parent == scope_.top()) return at;
    auto above = store_.byRecord(at.parent);
    if (!above) return std::nullopt;
    at = std::move(*above);
  }
  return std::nullopt;
}

DocumentRecord AsItMayBeUsed(DocumentRecord document, const SyncContext &context) {
  const bool isDocument = document.kind == NSFileProviderItemKind::document;
  const SharedAccess access(context.store, context.scope);
  if (isDocument && !access.isWritable(document.record, document.parent)) document.content.mode &= ~0222U;
  return document;
}

}  // namespace droxa::keld

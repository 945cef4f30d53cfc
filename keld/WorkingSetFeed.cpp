#include "keld/WorkingSetFeed.h"

#include <algorithm>
#include <cstring>

namespace droxa::keld {

namespace {

constexpr char kMagic[] = "QVWS";
constexpr std::size_t kUUIDLength = 36;
constexpr std::size_t kTokenLength = 4 + kUUIDLength + 16;

// Private things are nobody's business, and the root and the containers' folders are no items.
bool isInFeed(const ItemRecord &record, const Containers &containers) {
  switch (record.zone()) {
    case Zone::shown:
    case Zone::trashed:
      return record.parent != kLimboFolder;
    case Zone::privateStorage:
      return false;
    case Zone::structure:
      break;
  }
  const ContainerEntry *entry = containers.byDocuments(record.id);
  return entry && containers.isListedInRoot(*entry);
}

}  // namespace

NSData WorkingSetToken::data() const {
  std::string bytes = kMagic + databaseUUID;
  for (const std::uint64_t number : {rank, deadUpTo})
    for (unsigned shift = 0; shift < 64; shift += 8) bytes += static_cast<char>((number >> shift) & 0xff);
  return NSData::dataWithString(bytes);
}

std::optional<WorkingSetToken> WorkingSetToken::parse(const NSData &data) {
  const auto bytes = data.bytes();
  if (bytes.size() != kTokenLength || std::memcmp(bytes.data(), kMagic, 4) != 0) return std::nullopt;
  WorkingSetToken token;
  token.databaseUUID.assign(reinterpret_cast<const char *>(bytes.data()) + 4, kUUIDLength);
  const auto number = [&](std::size_t at) {
    std::uint64_t value = 0;
    for (std::size_t index = 0; index < 8; ++index)
      value |= static_cast<std::uint64_t>(bytes[at + index]) << (8 * index);
    return value;
  };
  token.rank = number(4 + kUUIDLength);
  token.deadUpTo = number(4 + kUUIDLength + 8);
  return token;
}

WorkingSetBatch ReadWorkingSet(ItemQueries &queries, const ItemPresenter &presenter, const NSData &token,
                               std::uint64_t limit) {
  WorkingSetBatch batch;
  WorkingSetToken position;
  position.databaseUUID = queries.metaText("uuid");
  const std::uint64_t floor = queries.metaNumber("tombstoneFloor");
  position.deadUpTo = floor;
  if (token) {
    const auto parsed = WorkingSetToken::parse(token);
    batch.isExpired = !parsed || parsed->databaseUUID != position.databaseUUID ||
                      parsed->rank > queries.metaNumber("rank") ||
                      std::max(parsed->rank, parsed->deadUpTo) < floor;
    if (batch.isExpired) return batch;
    position = *parsed;
  }
  // Both come by rank, and no rank occurs twice.
  const std::vector<ItemRecord> changed = queries.changedAfter(position.rank, limit);
  const std::vector<Tombstone> dead = queries.deadAfter(position.rank, limit);
  std::size_t nextChanged = 0, nextDead = 0;
  for (std::uint64_t taken = 0; taken < limit; ++taken) {
    const bool haveChanged = nextChanged < changed.size();
    const bool haveDead = nextDead < dead.size();
    if (!haveChanged && !haveDead) break;
    if (haveChanged && (!haveDead || changed[nextChanged].rank < dead[nextDead].rank)) {
      const ItemRecord &record = changed[nextChanged++];
      position.rank = record.rank;
      if (isInFeed(record, presenter.containers())) batch.updated.push_back(presenter.item(record));
    } else {
      const Tombstone &tombstone = dead[nextDead++];
      position.rank = tombstone.rank;
      batch.deleted.push_back(FileObjectID(tombstone.id, tombstone.kind));
    }
  }
  batch.token = position.data();
  return batch;
}

}  // namespace droxa::keld

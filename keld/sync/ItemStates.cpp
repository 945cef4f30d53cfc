#include "keld/sync/ItemStates.h"

#include <utility>

namespace droxa::keld {

namespace {

constexpr std::size_t kMostAtOnce = 2000;

void apply(const ItemState &state, Reconciler &reconciler, ItemQueries &queries) {
  const auto record = queries.byID(state.item);
  if (!record || record->parent == kLimboFolder) return;
  const FileFacts &facts = record->facts;
  const bool isSame = !state.hasFile || record->isFolder() ||
                      (facts.inode == state.file.inode && facts.size == state.file.size &&
                       facts.modified == state.file.modified);
  std::uint32_t flags = 0;
  if (state.isDataless && isSame) flags |= kDatalessFlag;
  if (state.isUploaded && isSame) flags |= kUploadedFlag;
  reconciler.setSyncFlags(state.item, flags);
}

}  // namespace

void ItemStates::show(const ItemState &state) {
  bool isMany = false;
  {
    const Lock lock(mutex_);
    states_.push_back(state);
    isMany = states_.size() >= kMostAtOnce;
  }
  if (isMany) flush();
}

void ItemStates::showShared(ItemNumber item, bool isShared) {
  const Lock lock(mutex_);
  shared_[item] = isShared;
}

void ItemStates::flush(std::function<void()> done) {
  std::vector<ItemState> states;
  std::map<ItemNumber, bool> shared;
  {
    const Lock lock(mutex_);
    states.swap(states_);
    shared.swap(shared_);
  }
  Keeper *keeper = keeper_();
  if (!done) {
    if (states.empty() && shared.empty()) return;
    done = [] {};
  }
  if (!keeper) return done();
  keeper->perform(
      [states = std::move(states), shared = std::move(shared)](Reconciler &reconciler, ItemQueries &queries,
                                                               ItemEdits &) {
        // The table has to know the files that the states are of.
        for (const ItemState &state : states) {
          const auto record = state.hasFile ? queries.byID(state.item) : std::nullopt;
          if (record && !record->isFolder() && record->parent != kLimboFolder &&
              (record->facts.inode != state.file.inode || record->facts.modified != state.file.modified ||
               record->facts.size != state.file.size))
            reconciler.look(record->parent, record->name);
        }
        reconciler.settle();
        for (const ItemState &state : states) apply(state, reconciler, queries);
        for (const auto &[item, isShared] : shared) reconciler.setShared(item, isShared);
      },
      std::move(done));
}

void ItemStates::lookAt(std::vector<std::string> paths, std::function<void()> done) {
  Keeper *keeper = keeper_();
  if (!keeper || paths.empty()) return done();
  keeper->lookAtAll(std::move(paths), std::move(done));
}

}  // namespace droxa::keld

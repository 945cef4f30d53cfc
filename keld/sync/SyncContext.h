#pragma once

#include <memory>
#include <string>

#include "keld/contents/ContentsStorage.h"
#include "keld/sync/ItemStates.h"
#include "keld/sync/ReplicaFiles.h"
#include "keld/sync/SyncScope.h"
#include "keld/sync/SyncStore.h"
#include "platform/cloudkit/CKCloud.h"

namespace droxa::keld {

// What every part of the sync works with. Thread contract: constant; each member has its own.
struct SyncContext {
  SyncStore &store;
  ReplicaFiles &files;
  const ContentsStorage &storage;
  ItemStates &states;
  CKCloud &cloud;
  std::string device;  // this one's name
  SyncScope scope;
};

}  // namespace droxa::keld

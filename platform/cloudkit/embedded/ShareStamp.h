#pragma once

#include "platform/cloudkit/embedded/ShareTable.h"

namespace droxa::embedded {

// The share that saving the record makes: as its owner wants it, with what is the cloud's to fill in (the
// URL, the owner, the participants' identities and whether they have accepted). `current`: the share as it
// is. Throws CallFailed, having written nothing: invalidArguments, unknownItem, alreadyShared,
// tooManyParticipants. Thread contract: the connection's.
CKShare StampedShare(const Connection &connection, const Zone &zone, const CKRecord &record,
                     const std::optional<CKRecord> &current);

// A share as one account may see it that hasn't accepted it: of the participants the owner and itself.
CKShare ShareForInvited(CKShare share, const std::string &accountName);

}  // namespace droxa::embedded

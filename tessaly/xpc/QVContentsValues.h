#pragma once

#include "tessaly/QVContents.h"
#include "tessaly/xpc/QVContents.capnp.h"

// The values of tessaly/QVContents.h into and out of messages; see platform/xpc/capnp/Values.h.

namespace droxa {

void writeContentsStatus(schema::QVContentsStatus::Builder builder, const QVContentsStatus &status);
QVContentsStatus readContentsStatus(schema::QVContentsStatus::Reader reader);
void writeTransferStatus(schema::QVTransferStatus::Builder builder, const QVTransferStatus &status);
QVTransferStatus readTransferStatus(schema::QVTransferStatus::Reader reader);
void writeContentsResult(schema::QVContentsResult::Builder builder, const QVContentsResult &result);
QVContentsResult readContentsResult(schema::QVContentsResult::Reader reader);

}  // namespace droxa

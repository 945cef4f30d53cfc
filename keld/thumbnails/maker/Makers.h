#pragma once

#include "keld/thumbnails/maker/Serving.h"

namespace droxa::keld {

// Loads the library and shuts out what it would open by way of other programs' code. Once, before the first
// fork.
bool PrepareImageMaker();

// Of a photograph, or with MakerKind::drawing of a drawing made of lines: turned upright, in sRGB, without
// metadata, never larger than the image.
std::string MakeImageThumbnail(const MakerJob &job);

// Of the first page of a PDF document, on white paper, as large as a thumbnail may be.
std::string MakePageThumbnail(const MakerJob &job);

// For commands that write a file: runs `command` and prints that file, marked as a thumbnail. An exit status.
int PrintFileOf(char **command, const char *file);

}  // namespace droxa::keld

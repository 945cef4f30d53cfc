#pragma once

namespace droxa {

// Keys of an item's record in the cloud that others than keld name. A document's thumbnail is a PNG asset
// that fits 1024 x 1024 pixels; a record has none where none could be made, or none was made yet.
inline constexpr char kQVRecordKeyThumbnail1024x1024[] = "thumbnail1024x1024";
inline constexpr char kQVRecordKeySize[] = "size";  // of the contents, in bytes

}  // namespace droxa

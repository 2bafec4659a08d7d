#pragma once

namespace dlp {

// The extension that HashMap::get gives the file manager's last opened zip: whatever the file
// manager creates next comes out of that archive.
constexpr char kUnpackedFromZipExtension[] = "unzip";

}  // namespace dlp

// Files the vantish command writes for other programs: each one appears
// whole or not at all.
#pragma once

#include <filesystem>
#include <string_view>

namespace vantish {

// Writes `content` into a temporary file beside `path` and renames it over
// `path` once it is complete. Throws std::runtime_error ("PATH: cannot write
// (reason)") and leaves no temporary file when any step fails.
void writeWhole(const std::filesystem::path& path, std::string_view content);

} // namespace vantish

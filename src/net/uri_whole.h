// URL joining for the library's own downloads, where a result cut to fit would fetch some other
// resource.
#pragma once

namespace ka {

// CombineURL into out (kUrlSize bytes), but false when the result does not fit whole (out then
// holds the cut form, which must not be used) or an argument is null.
bool CombineUrlWhole(char* out, const char* ref, const char* base);

}  // namespace ka

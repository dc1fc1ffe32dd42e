// quarrin-inspect: what the host makes of plug-in bundles, for their authors
// and packagers. Every call into plug-in code goes through the helper process,
// so a plug-in that crashes or hangs is a problem reported, not a crash here.
#pragma once

namespace qr {

extern const char kInspectUsage[];

// The whole program; returns its exit status: 0 when no bundle has a
// problem, 1 when one has, 2 for a usage error or a path that is no bundle.
int runInspect(int argc, char** argv);

}  // namespace qr

// Depth-first walk over the directories below some roots, following symbolic
// links. Entries that say they are directories are taken at their word, so a
// walk over a few thousand plug-in bundles costs one read of each folder and
// no stat() per bundle; only links and entries of unknown type are stat'ed.
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace qr {

// Called for each directory in the order the system lists them: each root at
// level 0 (as given), then a directory's entries at the next level, each path
// its parent's (less one trailing "/") with "/" and the name. Returns whether
// to go into it.
using DirectoryVisitor = std::function<bool(const std::string& path, int level)>;

// A root that is not a directory, or is empty, is passed over. A directory
// reached again below itself through a link is neither visited nor entered;
// one that cannot be read is visited and left. So is one that loops back
// through a bind mount, which only opening it shows. The walk goes as deep as
// the visitor lets it; paths longer than the system takes end it.
void walkDirectories(const std::vector<std::string>& roots, const DirectoryVisitor& visit);

}  // namespace qr

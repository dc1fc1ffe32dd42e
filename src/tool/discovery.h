// Module discovery: when the printing preference "support_quarrin" is "YES",
// walk the search directories of the framework's module search settings and
// register every plug-in bundle with the host of its kind.
#pragma once

#include "hosts/iom_host.h"
#include "hosts/pbm_host.h"
#include "hosts/pm_host.h"
#include "values/dictionary.h"

namespace qr {

// Walks to depth maxLevel - 1; a directory at maxLevel is neither examined nor entered.
void discoverModules(int maxLevel, PMHost& pmHost, IOMHost& iomHost, PBMHost& pbmHost);

// "PM Search Directories", "PM Exclude Directories", "PM Exclude Matches";
// kept once read; null while the resource cannot be read.
Dictionary* moduleSearchSettings();

// Forgets the remembered gate and settings, for tests that change them.
void forgetDiscoverySettings();

}  // namespace qr

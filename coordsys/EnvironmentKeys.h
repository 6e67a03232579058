// The keys of the table of directory settings. They are told apart by case.
#ifndef ZMC_COORDSYS_ENVIRONMENTKEYS_H
#define ZMC_COORDSYS_ENVIRONMENTKEYS_H

#include "core/String.h"

namespace zelm::EnvironmentKeys {

// Directory that holds the library of the projection engine.
inline const String kBinDirectory("ZELM::Environment::BinDirectory");
inline const String kXmlDirectory("ZELM::Environment::XmlDirectory");  // not read here
// Data directory of the projection engine, where the projection log has its files too.
inline const String kPeDirectory("ZELM::Environment::PeDirectory");
// Second directory handed to the projection engine.
inline const String kGdalDirectory("ZELM::Environment::GdalDirectory");
inline const String kMdfDirectory("ZELM::Environment::MdfDirectory");  // not read here
inline const String kWorkingDirectory("ZELM::WorkingDirectory");       // not read here

// What stands for a directory without a setting. It is no path: a folder of that name below the
// working directory, which belongs to whoever started the process, is nothing of ours.
inline const String kNotSet("Not Set");

}  // namespace zelm::EnvironmentKeys

#endif

// Targets in object stores: their names, "s3://BUCKET/KEY" or "/vsis3/BUCKET/KEY", and the store
// behind one, reached by the settings by which GDAL reads from there (AWS_ACCESS_KEY_ID,
// AWS_S3_ENDPOINT and the like, in the environment or in GDAL's configuration).
#ifndef ZMC_TOOLS_STORETARGET_H
#define ZMC_TOOLS_STORETARGET_H

#include <memory>
#include <string>

#include "store/ObjectStore.h"

namespace zmctools {

// Whether a name is that of an object, or is meant to be one.
bool IsObjectName(const std::string& name);

// The name behind the last slash of an object's.
std::string LastNameOf(const std::string& object);

// The store of the object of that name; nothing is asked of it yet. An interruption ends what it
// does by zmchost::Cancelled. Throws Failure for a name that is none of an object, and for settings
// that are missing or cannot be.
std::unique_ptr<zmcstore::ObjectStore> OpenStore(const std::string& object);

}  // namespace zmctools

#endif

// Root of the helpers around metadata trees: a name for what they are, with nothing in it.
#ifndef ZMC_METADATA_METADATAUTILS_H
#define ZMC_METADATA_METADATAUTILS_H

class MetadataUtils {};

#endif

// OpenRegularFilesOnly: keeps GDAL from what is no file.
//
// GDAL looks for companions of a raster under names beside it, and for parts of one under names
// that stand in it, and opens whatever is there. Whoever may write a folder can put a pipe there,
// at which an opening waits for ever. From now on what is neither a regular file nor a folder does
// not open, for plain names; virtual file systems are not concerned.
#ifndef ZMC_TOOLS_REGULARFILES_H
#define ZMC_TOOLS_REGULARFILES_H

namespace zmctools {

// Once, after GDAL has started and before it opens anything.
void OpenRegularFilesOnly();

}  // namespace zmctools

#endif

#include "dispatch/RasterReaderDispatch.h"

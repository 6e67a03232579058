// SharedBlocks: a band whose blocks in GDAL's cache several threads may ask for at once.
//
// From 3.10 on GDAL lets a dataset say that threads may share it, and lets bands guard what GDAL
// itself keeps of them; before that there is no such dataset. One of a CompanionDataset that is
// shared has its blocks made one after the other. Windows that are read without these blocks are
// not affected.
#ifndef ZMC_GDAL_SHAREDBLOCKS_H
#define ZMC_GDAL_SHAREDBLOCKS_H

#include <gdal_priv.h>

#include <mutex>

#include "gdal/Companions.h"

namespace zmcgdal {

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 10, 0)

template <class Base>
class SharedBlocks : public Base {
public:
    GDALRasterBlock* GetLockedBlockRef(int blockX, int blockY,
                                       int justInitialize = FALSE) override {
        const auto lock = Lock();
        return Base::GetLockedBlockRef(blockX, blockY, justInitialize);
    }
    GDALRasterBlock* TryGetLockedBlockRef(int blockX, int blockY) override {
        const auto lock = Lock();
        return Base::TryGetLockedBlockRef(blockX, blockY);
    }
    CPLErr FlushBlock(int blockX, int blockY, int writes = TRUE) override {
        const auto lock = Lock();
        return Base::FlushBlock(blockX, blockY, writes);
    }
    CPLErr FlushCache(bool atClosing = false) override {
        const auto lock = Lock();
        return Base::FlushCache(atClosing);
    }
    // GDAL remembers pixels of the band for this.
    CPLErr InterpolateAtPoint(double pixel, double line, GDALRIOResampleAlg method, double* real,
                              double* imaginary = nullptr) const override {
        const auto lock = Lock();
        return Base::InterpolateAtPoint(pixel, line, method, real, imaginary);
    }

private:
    mutable std::recursive_mutex blocks;

    std::unique_lock<std::recursive_mutex> Lock() const {
        std::unique_lock lock(blocks, std::defer_lock);
        const auto* const dataset = static_cast<const CompanionDataset*>(this->poDS);
        if (dataset && dataset->IsShared()) lock.lock();
        return lock;
    }
};

#else

template <class Base>
class SharedBlocks : public Base {};

#endif

}  // namespace zmcgdal

#endif

#pragma once

#include "datasources/reader/derived/derivedreader.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::gobs
{
struct PowerTerm;
}

namespace krv::datasources
{

// What the channels of a radar scene hold.
enum ePowerSource
{
    // What the tag "Matrix_Type" of the file or of the channels says; where it names nothing of the following, complex
    // channels are scattering elements and real ones intensities. A text that begins with S (S2, scattering) names
    // scattering elements, one with C or T (C3, T4, covariance, coherency) a matrix, of as many rows as a digit behind
    // the letter says, one with I intensities, one with A amplitudes; letter case does not count.
    ePowerByRecord = 0,
    eScatteringElements = 1, // complex: the sum of re^2 + im^2; three of them: the middle one, or the one described as
                             // HV or VH, counts twice, since HV = VH
    eHermitianMatrix = 2,    // covariance or coherency: the sum of its real diagonal
    eIntensities = 3,        // real: their sum
    eAmplitudes = 4          // real: the sum of squares
};

// Example: HH and VV of a scene of four channels: {.moChannels = {1, 4}}.
struct PowerRequest
{
    ePowerSource meSource = ePowerByRecord;
    std::vector<unsigned int> moChannels = {}; // of the source, from 1; none: all but alpha
    std::vector<double> moWeights = {};        // one per channel of the list, in place of the usual ones; none: those
};

// Shows a radar scene as the power of its pixels: one channel, 64R over parts of 64R and integers of 32 and 64 bits,
// else 32R; added up in doubles and rounded once, in one pass over the samples.
//
// The diagonal of a matrix is found by the channels' descriptions (C11, T22), else among channels of mixed types as the
// real ones, else by their places: n channels are the diagonal, n * n real ones, or n * (n + 1) / 2 complex ones, the
// upper triangle row by row. What does not fit is a DataException that names the channel.
//
// A pixel is invalid when any channel of it is, and NaN then. The record says "nan" as no-data value when the source
// has anything that makes pixels invalid, no-data, mask or alpha, and nothing otherwise. By contract GetNoDataValue
// answers true with the value 0 to that text, and GetNoDataMaskBuilder throws; IValidityReader and the typed no-data
// functions are the ways. Levels are those of the source that hold power: of intensities and matrices all, of
// scattering elements and amplitudes those made by NEAREST or RMS, since the power of a mean is not the mean of power.
// It shows no dataset: the values of its pixels are not those of one.
// Example: TotalPowerRasterReader oPower("slc.tif"); decibels are 10 * log10 of its values.
class KRV_DATASOURCES_API TotalPowerRasterReader : public DerivedReader
{
public:
    // The source outlives this reader unless bTakeOwnership says that it goes with it; on failure it stays the
    // caller's. Its channels may be of different types beneath a promoted one. Throws DataException for a null source
    // and for channels that do not fit.
    TotalPowerRasterReader(IRasterReader* poSource, bool bTakeOwnership, const PowerRequest& oRequest = {});
    // Channels of a dataset, of which those that count are read. Ownership as above.
    TotalPowerRasterReader(IDataset* poDataset, bool bTakeOwnership, const PowerRequest& oRequest = {});
    // The same of a file.
    explicit TotalPowerRasterReader(const std::string& fileName, const PowerRequest& oRequest = {});
    TotalPowerRasterReader(const TotalPowerRasterReader&) = delete;
    TotalPowerRasterReader& operator=(const TotalPowerRasterReader&) = delete;
    ~TotalPowerRasterReader() override;

    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    unsigned int GetChansCount() const override { return 1; }
    const krv::gobs::DataType& GetDataType() const override;
    IDataset* GetDataset() const override { return nullptr; }
    const std::vector<unsigned int>& GetChannels() const override;

    bool HasValidity() override;
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

private:
    struct State;

    TotalPowerRasterReader(OwnedOrBorrowed<IRasterReader> oSource, const std::vector<krv::gobs::PowerTerm>& oTerms);

    void UseSource(OwnedOrBorrowed<IRasterReader> oSource, const std::vector<krv::gobs::PowerTerm>& oTerms);
    void UseDataset(OwnedOrBorrowed<IDataset> oDataset, const PowerRequest& oRequest, const krv::Place& oPlace);

    OwnedOrBorrowed<IDataset> mpoDataset; // of the source, which goes first
    std::unique_ptr<State> mpoState;
};

} // namespace krv::datasources

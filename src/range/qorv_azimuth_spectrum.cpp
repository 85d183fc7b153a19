#include "qorv_azimuth_spectrum.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_doppler_estimation.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_read_write_info.h"

namespace {

constexpr int CQORV_ASIQ_POL_DEG_AZ_DOPP_POS = 5;
constexpr int CQORV_DOPPLER_TABLE_ROWS = 50;

/// Sets user keys of the header on disk at theRoot: read, set, write back.
void fSetUserKeysOnDisk(const std::string& theRoot, std::initializer_list<std::pair<const char*, std::string>> theKeys)
{
    const std::string aName = theRoot + "_hdr";
    std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
    if (!h->read(aName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", aName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, aName.c_str());
    }
    for (const auto& [aKey, aValue] : theKeys) fqorvSetUserKey(*h, aKey, aValue.c_str());
    if (!h->write(aName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aName.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aName.c_str());
    }
}

}  // namespace

int qorv_azsp_IQ(int argc, char** argv)
{
    fdfTrace("*** SAR IQ raw data azimuth spectrum v3.6 21-jun-99 xq ***\n");
    int aAzCoeff = 1;
    if (argc < 4) {
        fdfTrace("\nusage: %s <signal_data> <aSARProcessingParameters> <spectrum> [nsub] \n\n", argc > 0 ? argv[0] : "");
        fdfTrace("input parameters: \n");
        fdfTrace("signal_data        input uncompressed IQ raw SAR data file\n");
        fdfTrace("aSARProcessingParameters processing parameter file\n");
        fdfTrace("spectrum           output azimuth spectrum\n");
        fdfTrace("nsub               # of azimuth subapertures (default = %d)\n", 8);
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    fdfTrace("argc = %d\nCQORV_ASIQ_POL_DEG_AZ_DOPP_POS = %d\n", argc, CQORV_ASIQ_POL_DEG_AZ_DOPP_POS);
    if (argc > CQORV_ASIQ_POL_DEG_AZ_DOPP_POS && std::strcmp(argv[CQORV_ASIQ_POL_DEG_AZ_DOPP_POS], "NotOK") != 0) {
        aAzCoeff = std::atoi(argv[CQORV_ASIQ_POL_DEG_AZ_DOPP_POS]);
        fdfTrace("aAzCoeff = %d\n", aAzCoeff);
    }
    std::string aReason;
    if (!fdfEstimateDoppler(argv[1], aAzCoeff, 0, CQORV_DOPPLER_TABLE_ROWS, false, &aReason))
        QORV_FATAL(CQORV_ERR_RASTER_ACCESS, (std::string(argv[1]) + ": no Doppler centroid estimate, " + aReason).c_str());
    YDF_SAR aSar;
    read_image_info(argv[1], aSar);
    const double aDoppler = aSar.getDopplerFromPixel(0.0, 0.0, false, false);
    fdfTrace("TBD get doppler : %f\n", aDoppler);
    fSetUserKeysOnDisk(argv[1], {{"DOPPLER VALUE(0   0)", fqorvStringFormat("%lf", aDoppler)},
                                 {"DOPPLER VALUE PARAM", fqorvStringFormat("Doppler estimation deg AZ : %d   ;  RG : %d", aAzCoeff, 0)}});
    return 0;
}

int qorv_azsp_IQ_shut(int argc, char** argv)
{
    if (argc < 4) {
        fdfTrace("\nSHUT %s", argc > 0 && argv[0] ? argv[0] : "");
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    std::remove(argv[3]);
    return 0;
}

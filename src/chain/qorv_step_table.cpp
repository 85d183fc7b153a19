// The step table of the chain: nine rows of title, run function and shut function.
#include <cstdio>
#include <string>

#include "qorv_chain_driver.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_autofocus.h"
#include "qorv_az_SLC.h"
#include "qorv_azimuth_spectrum.h"
#include "qorv_multi_SLC.h"
#include "qorv_pre_rc.h"
#include "qorv_proc_param.h"
#include "qorv_raster_to_geotiff.h"

namespace {

/// Run function of a step that this build does not hold yet: it fails loudly, naming the step.
int stepNotBuilt(int theArgc, char** theArgv)
{
    const std::string aTitle = theArgc > 0 && theArgv[0] ? theArgv[0] : "";
    const std::string aText = "step not built:" + aTitle;  // fits one line of the result files
    fdfTrace("\nError: %s\n", aText.c_str());
    QORV_FATAL(CQORV_ERR_WRONG_REQUEST, aText.c_str());
}

void removeFile(const std::string& theName)
{
    fdfTrace("\nremove intermediate file : %s\n", theName.c_str());
    std::remove(theName.c_str());
}

/// Doppler ambiguity: removes the two look files named from its argument 1 with fqorvJoin,
/// which gives the doubled underscore "__amb1_mli" behind the range compressed file's name.
int shutDopplerAmbiguity(int theArgc, char** theArgv)
{
    if (theArgc > 1) {
        QorvString aLook1(fqorvJoin(theArgv[1], "_amb1_mli"));
        QorvString aLook2(fqorvJoin(theArgv[1], "_amb2_mli"));
        removeFile(aLook1.get());
        removeFile(aLook2.get());
    }
    return 1;
}

}  // namespace

int fdfDefaultShut(int, char**) { return 1; }

const CStepRow CQORV_STEP_TABLE[CQORV_STEP_NBR] = {
    {"Processing parameters construction", qorv_proc_param, fdfDefaultShut},
    {"SAR IQ raw data azimuth spectrum", qorv_azsp_IQ, qorv_azsp_IQ_shut},
    {"range compression", qorv_pre_rc, fdfDefaultShut},
    {"autofocus", qorv_autofocus, fdfDefaultShut},
    {"doppler ambiguity", stepNotBuilt, shutDopplerAmbiguity},
    {"SAR azimuth omega/k processor", qorv_az_SLC, qorv_az_SLC_shut},
    {"multi look", qorv_multi_SLC, fdfDefaultShut},
    {"multi look to tiff conversion", qorv_raster_to_geotiff, fdfDefaultShut},
    {"slc to tiff conversion", qorv_raster_to_geotiff, fdfDefaultShut},
};

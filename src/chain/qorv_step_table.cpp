// The step table of the chain: nine rows of title, run function and shut function.
#include "qorv_chain_driver.h"

#include "qorv_autofocus.h"
#include "qorv_az_SLC.h"
#include "qorv_azimuth_spectrum.h"
#include "qorv_doppler_ambiguity.h"
#include "qorv_multi_SLC.h"
#include "qorv_pre_rc.h"
#include "qorv_proc_param.h"
#include "qorv_raster_to_geotiff.h"

int fdfDefaultShut(int, char**) { return 1; }

const CStepRow CQORV_STEP_TABLE[CQORV_STEP_NBR] = {
    {"Processing parameters construction", qorv_proc_param, fdfDefaultShut},
    {"SAR IQ raw data azimuth spectrum", qorv_azsp_IQ, qorv_azsp_IQ_shut},
    {"range compression", qorv_pre_rc, fdfDefaultShut},
    {"autofocus", qorv_autofocus, fdfDefaultShut},
    {"doppler ambiguity", qorv_doppler_ambiguity, qorv_doppler_ambiguity_shut},
    {"SAR azimuth omega/k processor", qorv_az_SLC, qorv_az_SLC_shut},
    {"multi look", qorv_multi_SLC, fdfDefaultShut},
    {"multi look to tiff conversion", qorv_raster_to_geotiff, fdfDefaultShut},
    {"slc to tiff conversion", qorv_raster_to_geotiff, fdfDefaultShut},
};

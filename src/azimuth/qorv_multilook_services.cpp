// The link of the multi-look step to the orbit library.
#include "qorv_multilook_services.h"

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_orbit_utility.h"

void fqorvMultiLookConvertStateVectors(CDescriptionHeader& theStore)
{
    fqorvConvertStateVectorsToEcr(theStore);
}

// The service of the orbit library that the multi-look step calls: the frame conversion of the
// state vectors.
#pragma once

#include "qorv_product_files.h"

class CDescriptionHeader;

/// Rotates the inertial ("IRS") state vectors of a store to the Earth-fixed frame and marks the
/// store "ECR"; the orbit library's store operation.
void fqorvMultiLookConvertStateVectors(CDescriptionHeader& theStore);

#include "qorv_prf_extraction.h"

void fdfExtractPrfChanges(const char* /*theInput*/) {}

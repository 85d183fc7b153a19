// The header chain of a list of products: the first product's estimates rule all products,
// while each product keeps its channel.
#pragma once

/// Reads theSource + theSuffix and writes it unchanged under theTarget + theSuffix.
void fdfCopyHeader(const char* theSource, const char* theTarget, const char* theSuffix);
/// Writes theSource + theSuffix + "_hdr" under theTarget's name, keeping the target's channel fields.
void fdfInheritHeader(const char* theSource, const char* theTarget, const char* theSuffix);

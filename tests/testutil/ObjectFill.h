// Objects with every field set, for tests and benchmarks: fills by the one object builder, and
// the address of the worked example. Header-only so that benchmarks can use it without the test
// library.
#pragma once

#include "RandomObject.h"  // beside this file: benchmarks include it by path

namespace sarntest {

// Sets every field that the current records describe (version 0), `nMulti` elements per array,
// and nested objects down to `depth` more levels (required ones a little further); KNOWN_DICT
// and lazy fields hold a `success`. Strings hold bytes that JSON must escape unless `fPlainText`.
// The same seed fills equal objects.
inline void FillObject(VekMempool* pool, sarn::SarnObject* object, unsigned seed, int depth, unsigned nMulti = 2,
                       bool fPlainText = false) {
  RandomObjects fill(pool, seed, {543}, depth);
  fill.nEveryM = static_cast<int>(nMulti);
  fill.isPlainM = fPlainText;
  fill.Fill(object);
}

// The address of the worked example: id 7, Oslo, NO, level of detail high, postal code 0150, an
// empty state, street1 Main St 1, no street2.
inline ref<sarn::SarnObject> MakeWorkedAddress(VekMempool* pool) {
  ref<sarn::SarnObject> object = sarnschema::Address::Factory(pool);
  auto* address = static_cast<sarnschema::Address*>(object.Get());
  address->addressIdM = 7;
  address->fHasAddressIdM = true;
  address->cityM = "Oslo";
  address->countryM = "NO";
  address->levelOfDetailM = 2;
  address->fHasLevelOfDetailM = true;
  address->postalCodeM = "0150";
  address->street1M = "Main St 1";
  return object;
}

}  // namespace sarntest

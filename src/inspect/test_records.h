#pragma once

#include "ironmoat/fields.h"
#include "ironmoat/values.h"

/// Small records with a field of each type that records have, for the tests of both views.
namespace ironmoat::inspect {

struct PartArguments {
  Optional<String> name;
  Optional<Int> number;

  using Fields = FieldList<PartArguments, &PartArguments::name, &PartArguments::number>;
};
struct Part : PartArguments {
  using Arguments = PartArguments;
};

struct Whole;
struct WholeArguments {
  Int command = 0;
  Optional<Int64> time;
  Optional<Bool> flag;
  Optional<String> text;
  Optional<Data> bytes;
  Optional<List<String>> texts;
  Optional<Part> part;
  List<Whole> wholes;

  using R = WholeArguments;
  using Fields = FieldList<R, &R::command, &R::time, &R::flag, &R::text, &R::bytes, &R::texts,
                           &R::part, &R::wholes>;
};
struct Whole : WholeArguments {
  using Arguments = WholeArguments;
};

}  // namespace ironmoat::inspect

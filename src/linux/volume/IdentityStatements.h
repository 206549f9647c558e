#pragma once

#include <memory>
#include <vector>

#include "linux/volume/Database.h"

namespace mirabel {

/// The tables of the volume's database, and the statements on them that `IdentityStore` binds and
/// steps.
struct IdentityStatements {
  std::vector<Statement> all;  // in the order of the texts
  Statement& bySlot = all[0];
  Statement& byInode = all[1];
  Statement& byFileID = all[2];
  Statement& byDocument = all[3];
  Statement& byPlace = all[4];
  Statement& byForeign = all[5];
  Statement& slotOfInode = all[6];
  Statement& following = all[7];
  Statement& occupied = all[8];
  Statement& insert = all[9];
  Statement& update = all[10];
  Statement& remove = all[11];
  Statement& linkAt = all[12];
  Statement& linksOf = all[13];
  Statement& addLink = all[14];
  Statement& removeLink = all[15];
  Statement& anyLink = all[16];
  Statement& handoverAt = all[17];
  Statement& handoversOf = all[18];
  Statement& addHandover = all[19];
  Statement& removeHandovers = all[20];
  Statement& anyHandover = all[21];
  Statement& children = all[22];
  Statement& nameCount = all[23];
  Statement& linksIn = all[24];
  Statement& meta = all[25];
  Statement& setMeta = all[26];
  Statement& updateState = all[27];
  Statement& anyChild = all[28];

  static const char* const schema;
  /// Errors: those of `Database::prepare`.
  [[nodiscard]] static Result<std::unique_ptr<IdentityStatements>> prepare(Database& database);
};

}  // namespace mirabel

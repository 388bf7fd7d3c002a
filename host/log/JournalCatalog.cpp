// SPDX-License-Identifier: Apache-2.0
#include "host/log/JournalCatalog.h"

#include <array>

namespace tarn::linux_host {

namespace {

using platform::LogCondition;

constexpr std::array kCatalog{
    CatalogEntry{LogCondition::StoreSetAside, "f1ba60a9267a4415a8d4d183ae0e2eb1", "The recorder's file was set aside",
                 "The file could not be used as it was. It lies beside the fresh one under another name,\n"
                 "and what could be read of it is carried over; a further line says how much.\n"
                 "\n"
                 "Look at the disk. `tarnreportingctl check --store` compares what is there with its checksums."},
    CatalogEntry{LogCondition::StoreDamaged, "163f73e0f62c4dbd8d4f0d5ed52f82df",
                 "Committed events are missing in the recorder's file",
                 "The write-ahead log was damaged, cut or taken away while no service ran. The ids of the\n"
                 "events that are missing are not given again.\n"
                 "\n"
                 "Look at the disk, and at who copies or removes files in the state directory."},
    CatalogEntry{LogCondition::StoreUnwritable, "da3d3bbf977a4eb786993de478f06e80",
                 "The recorder can't write to its file",
                 "The disk is full, read-only or failing. Events wait in memory within a bound, then clients\n"
                 "are slowed; nothing is dropped while the service lives. A line says when it is over.\n"
                 "\n"
                 "Make room, or lower [recorder] max_megabytes in the configuration."},
    CatalogEntry{LogCondition::RunKilled, "e7ccb81d681b43fc8edc0f8b607e6f62",
                 "The run before was killed and lost events",
                 "The service ended without committing what it had been handed. Sessions that were open have\n"
                 "ended as \"killed\".\n"
                 "\n"
                 "Look for what ended it: the watchdog, a lack of memory, a power cut."},
    CatalogEntry{LogCondition::QuotaRefused, "f06c27b5d8c147ffbd4785ef5f56c715",
                 "A request of process @TARN_PID@ was refused: over quota",
                 "User @TARN_UID@ or one of its connections has as much as it may have. The connection goes on;\n"
                 "further refusals of it are counted, not told.\n"
                 "\n"
                 "`tarnreportingctl status --quotas` tells what everybody has. The bounds stand in [limits] of\n"
                 "the configuration."},
    CatalogEntry{LogCondition::ClientCut, "d6cf44cb399e4da8a6edde0e419d7b87",
                 "The connection of process @TARN_PID@ was closed",
                 "The client sent what can't be read, began a frame and didn't end it, or didn't read its\n"
                 "replies. Its sessions have ended; others never notice.\n"
                 "\n"
                 "It is the program of user @TARN_UID@ that is to be mended."},
    CatalogEntry{LogCondition::LogUnavailable, "b11638be08f94aff867b9def21a4427e",
                 "Log lines were lost or go elsewhere",
                 "The log's reader was slow, gone or full for longer than lines are kept, or there was no\n"
                 "journal at the start. What is recorded doesn't depend on the log."},
    CatalogEntry{LogCondition::ReloadRefused, "30c3bd9f03074ed6a7e703c9d02e8905", "The configuration was not read anew",
                 "A file of the configuration is wrong; the line names it. The configuration from before stays\n"
                 "in effect.\n"
                 "\n"
                 "Mend the file and ask for a reload again."},
    CatalogEntry{LogCondition::ConfigurationRefused, "b60f9260dbf9428f9f8ea2408df0d87f",
                 "The service doesn't start with its configuration",
                 "A configuration or device-properties file is wrong; the line names the file and the line in\n"
                 "it. The service isn't started again before it is mended.\n"
                 "\n"
                 "Mend the file, then `systemctl restart tarnreportingd.socket`."},
};

}  // namespace

std::span<const CatalogEntry> journalCatalog() noexcept {
  return kCatalog;
}

std::string_view messageIdOf(LogCondition condition) noexcept {
  for (const CatalogEntry& entry : kCatalog) {
    if (entry.condition == condition) return entry.messageId;
  }
  return {};
}

std::string catalogText() {
  std::string text = "# Made of host/log/JournalCatalog.cpp: change that, not this.\n";
  for (const CatalogEntry& entry : kCatalog) {
    text.append("\n-- ").append(entry.messageId).append("\nSubject: ").append(entry.subject);
    text.append("\nDefined-By: tarnreporting\nDocumentation: man:tarnreportingd(8)\n\n")
        .append(entry.text)
        .append("\n");
  }
  return text;
}

}  // namespace tarn::linux_host

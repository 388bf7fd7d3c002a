#include "wire/Operation.h"

namespace tarn::wire {

namespace {

struct Row {
  Operation operation;
  std::string_view name;
  std::size_t arguments;
};

constexpr Row kRows[] = {
    {Operation::CreateReportingSession, "createReportingSession", 1},
    {Operation::SetServiceType, "setServiceType", 2},
    {Operation::GetServiceNameForReporterID, "getServiceNameForReporterID", 1},
    {Operation::SetConfiguration, "setConfiguration", 2},
    {Operation::StartReportingSessionForID, "startReportingSessionForID", 1},
    {Operation::SendMessage, "sendMessage", 4},
    {Operation::StopReportingSessionForID, "stopReportingSessionForID", 1},
    {Operation::DestroyReportingSession, "destroyReportingSession", 1},
    {Operation::ReporterID, "reporterID", 1},
    {Operation::GetAllReporters, "getAllReporters", 0},
    {Operation::KillService, "killService", 0},
    {Operation::Status, "status", 0},
};

constexpr bool rowsStandAtTheirNumbers() {
  for (std::size_t i = 0; i + 1 < std::size(kRows); ++i) {
    if (static_cast<std::size_t>(kRows[i].operation) != i + 1) return false;
  }
  return kRows[std::size(kRows) - 1].operation == Operation::Status;
}
static_assert(rowsStandAtTheirNumbers());

const Row& rowOf(Operation operation) noexcept {
  return operation == Operation::Status ? kRows[std::size(kRows) - 1] : kRows[static_cast<std::size_t>(operation) - 1];
}

}  // namespace

std::optional<Operation> operationFromNumber(std::uint64_t number) noexcept {
  const bool known = (number >= 1 && number <= 11) || number == 100;
  return known ? std::optional(static_cast<Operation>(number)) : std::nullopt;
}

std::string_view operationName(Operation operation) noexcept {
  return rowOf(operation).name;
}

std::optional<Operation> operationFromName(std::string_view name) noexcept {
  for (const Row& row : kRows) {
    if (row.name == name) return row.operation;
  }
  return std::nullopt;
}

std::size_t argumentCount(Operation operation) noexcept {
  return rowOf(operation).arguments;
}

}  // namespace tarn::wire

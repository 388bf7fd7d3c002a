// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/Database.h"

#include <libpq-fe.h>

#include <charconv>

namespace tarn::fleet {

namespace {

// What is said before the URL, which may say otherwise: a place that doesn't answer isn't waited for for ever.
constexpr const char* kNames[] = {"connect_timeout",
                                  "keepalives_idle",
                                  "keepalives_interval",
                                  "keepalives_count",
                                  "tcp_user_timeout",
                                  "application_name",
                                  "dbname",
                                  nullptr};

std::string lineOf(std::string text) {
  while (!text.empty() && text.back() == '\n') {
    text.pop_back();
  }
  for (char& c : text) {
    c = c == '\n' || c == '\t' ? ' ' : c;
  }
  return text;
}

std::int64_t codeOf(std::string_view state) {
  const std::string_view kind = state.substr(0, 2);
  // 23514: the day's partition was dropped since it was looked for. 40: deadlocks and the like.
  if (state == "23514" || kind == "40" || state == "55P03") return kFaultOfTurn;
  if (kind == "22" || kind == "23" || kind == "54") return kFaultOfData;
  return kFaultOfPlace;
}

}  // namespace

void Answer::Clear::operator()(pg_result* result) const {
  PQclear(result);
}

int Answer::rows() const {
  return PQntuples(result_.get());
}

std::string_view Answer::text(int row, int column) const {
  return {PQgetvalue(result_.get(), row, column), static_cast<std::size_t>(PQgetlength(result_.get(), row, column))};
}

bool Answer::isNull(int row, int column) const {
  return PQgetisnull(result_.get(), row, column) == 1;
}

std::int64_t Answer::number(int row, int column) const {
  const std::string_view digits = text(row, column);
  std::int64_t value = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), value);
  return value;
}

double Answer::real(int row, int column) const {
  const std::string_view digits = text(row, column);
  double value = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), value);
  return value;
}

std::int64_t Answer::changed() const {
  const std::string_view digits = PQcmdTuples(result_.get());
  std::int64_t value = 0;
  std::from_chars(digits.data(), digits.data() + digits.size(), value);
  return value;
}

void Database::Finish::operator()(pg_conn* connection) const {
  PQfinish(connection);
}

Status Database::open(const std::string& url, const char* program) {
  const char* const values[] = {"5", "10", "5", "3", "20000", program, url.c_str(), nullptr};
  connection_.reset(PQconnectdbParams(kNames, values, 1));
  if (isOpen()) {
    // Days and hours are those of UTC. Notices tell of what is meant to be so.
    return run("SET timezone = 'UTC'; SET client_min_messages = warning; SET client_encoding = 'UTF8'");
  }
  Error error{kFaultOfPlace, "database: " + lineOf(PQerrorMessage(connection_.get()))};
  close();
  return error;
}

bool Database::isOpen() const {
  return connection_ && PQstatus(connection_.get()) == CONNECTION_OK;
}

Error Database::errorOf(const pg_result* result) const {
  const char* const state = PQresultErrorField(result, PG_DIAG_SQLSTATE);
  const std::string text = lineOf(state != nullptr ? PQresultErrorMessage(result) : PQerrorMessage(connection_.get()));
  return {state != nullptr ? codeOf(state) : kFaultOfPlace, "database: " + text};
}

Result<Answer> Database::take(pg_result* result) {
  Answer answer(result);
  const ExecStatusType status = PQresultStatus(result);
  if (status == PGRES_COMMAND_OK || status == PGRES_TUPLES_OK) return {std::move(answer), {}};
  return {{}, errorOf(result)};
}

Result<Answer> Database::ask(const std::string& sql) {
  return take(PQexec(connection_.get(), sql.c_str()));
}

Result<Answer> Database::ask(const std::string& sql, const std::vector<std::string>& values) {
  std::vector<const char*> texts;
  for (const std::string& value : values) {
    texts.push_back(value.c_str());
  }
  return take(PQexecParams(connection_.get(), sql.c_str(), static_cast<int>(texts.size()), nullptr, texts.data(),
                           nullptr, nullptr, 0));
}

Status Database::run(const std::string& sql) {
  return ask(sql).error;
}

Status Database::copy(const std::string& sql, const std::string& rows) {
  pg_conn* const connection = connection_.get();
  pg_result* const begun = PQexec(connection, sql.c_str());
  if (const Answer owned(begun); PQresultStatus(begun) != PGRES_COPY_IN) return errorOf(begun);
  const bool isSent = PQputCopyData(connection, rows.data(), static_cast<int>(rows.size())) == 1 &&
                      PQputCopyEnd(connection, nullptr) == 1;
  Status status;
  while (pg_result* const result = PQgetResult(connection)) {
    const Result<Answer> taken = take(result);
    if (taken.failed() && status.ok()) {
      status = taken.error;
    }
  }
  if (!isSent && status.ok()) return errorOf(nullptr);
  return status;
}

void Database::rollBack() {
  if (isOpen() && PQtransactionStatus(connection_.get()) != PQTRANS_IDLE && run("ROLLBACK").failed()) {
    close();
  }
}

Status checkDatabaseUrl(const std::string& url) {
  // A name alone is a database's.
  if (url.find('=') == std::string::npos && url.find("://") == std::string::npos) return {};
  char* text = nullptr;
  PQconninfoOption* const options = PQconninfoParse(url.c_str(), &text);
  const std::string why = text == nullptr ? "out of memory" : lineOf(text);
  PQfreemem(text);
  if (options == nullptr) return Error{kFaultOfData, why};
  PQconninfoFree(options);
  return {};
}

std::string arrayOf(const std::vector<std::string>& texts) {
  std::string array = "{";
  for (const std::string& text : texts) {
    array += array.size() > 1 ? ",\"" : "\"";
    for (const char c : text) {
      if (c == '"' || c == '\\') {
        array += '\\';
      }
      array += c;
    }
    array += '"';
  }
  return array + "}";
}

}  // namespace tarn::fleet

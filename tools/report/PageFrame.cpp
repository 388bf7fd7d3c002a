// SPDX-License-Identifier: Apache-2.0
#include "tools/report/PageFrame.h"

#include "tools/report/Style.h"

namespace tarn::report {

void openPage(Markup& markup, const std::string& title) {
  markup.literal("<!DOCTYPE html>\n");
  markup.open("html", {{"xmlns", "http://www.w3.org/1999/xhtml"}, {"lang", "en"}, {"xml:lang", "en"}});
  markup.line().open("head").empty("meta", {{"charset", "utf-8"}});
  // Nothing is fetched or run, whatever stands in the page.
  markup.line().empty("meta", {{"http-equiv", "Content-Security-Policy"},
                               {"content", "default-src 'none'; style-src 'unsafe-inline'"}});
  markup.line().empty("meta", {{"name", "viewport"}, {"content", "width=device-width, initial-scale=1"}});
  markup.line().element("title", {}, title);
  markup.line().open("style").literal(kStyleSheet).close();
  markup.line().close();
  markup.line().open("body").line().open("main");
  markup.element("h1", {}, title);
}

void closePage(Markup& markup) {
  markup.line().close().line().close().line().close().line();
}

}  // namespace tarn::report

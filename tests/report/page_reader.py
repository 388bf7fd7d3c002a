# SPDX-License-Identifier: Apache-2.0
"""Reads a report's page as a tree, whether it is the file itself or what a browser made of it."""

import html.parser

VOID = {"meta", "br", "link", "img", "input"}


class Node:
    def __init__(self, name, attributes, parent):
        self.name, self.attributes, self.parent = name, dict(attributes), parent
        self.children = []

    def all(self, name=None):
        """This node and all below it, in the order of the page, of that name."""
        if name is None or self.name == name:
            yield self
        for child in self.children:
            if isinstance(child, Node):
                yield from child.all(name)

    def first(self, name):
        return next(self.all(name), None)

    def text(self):
        return "".join(child if isinstance(child, str) else child.text() for child in self.children)


class _Builder(html.parser.HTMLParser):
    def __init__(self):
        super().__init__(convert_charrefs=True)
        self.root = self.at = Node("", (), None)

    def handle_starttag(self, tag, attrs):
        node = Node(tag, attrs, self.at)
        self.at.children.append(node)
        if tag not in VOID:
            self.at = node

    def handle_startendtag(self, tag, attrs):
        self.at.children.append(Node(tag, attrs, self.at))

    def handle_endtag(self, tag):
        if tag in VOID:
            return
        if self.at.name != tag:
            raise ValueError(f"</{tag}> where <{self.at.name}> is open, line {self.getpos()[0]}")
        self.at = self.at.parent

    def handle_data(self, data):
        self.at.children.append(data)


def read(text):
    builder = _Builder()
    builder.feed(text)
    builder.close()
    if builder.at is not builder.root:
        raise ValueError(f"<{builder.at.name}> is never closed")
    return builder.root


def value(text):
    """A cell: a number where it is one."""
    try:
        return float(text)
    except ValueError:
        return text


def tables(root):
    """The rows of each table by its caption, each row a list of cells; headings of columns are left out."""
    found = {}
    for table in root.all("table"):
        rows = []
        for row in table.first("tbody").all("tr"):
            rows.append([value(cell.text()) for cell in row.children
                         if isinstance(cell, Node) and cell.name in ("th", "td")])
        caption = table.first("caption").text()
        if caption in found:
            raise ValueError(f"two tables are called {caption}")
        found[caption] = rows
    return found


def facts(table):
    return {row[0]: row[1] for row in table}

// SPDX-License-Identifier: GPL-2.0-or-later
// The words of one XML part of an office document, and its fields.
#pragma once

#include "extract/format.h"
#include "extract/xml_part.h"

namespace fileindexd {

// Text of word/document.xml, a slide, comments: runs of text, ended by paragraphs and cells.
// Deleted and moved text and field codes are left out.
void AddOoxmlWords(XmlPart& part, ContentSink& sink);
// A sheet: numbers and strings that stand in the cells themselves.
void AddSheetWords(XmlPart& part, ContentSink& sink);
// Names of the sheets.
void AddSheetNames(XmlPart& part, ContentSink& sink);
// docProps/core.xml and docProps/app.xml.
void SetOoxmlFields(XmlPart& part, ContentSink& sink);

// content.xml, styles.xml (running heads) and the flat form of all parts in one.
void ReadOdfPart(XmlPart& part, ContentSink& sink);
// meta.xml.
void ReadOdfMeta(XmlPart& part, ContentSink& sink);
// META-INF/manifest.xml.
bool IsOdfEncrypted(XmlPart& part);

// The words of a sheet's head or foot, which is mixed with marks: &L, &C and &R begin a third of
// the line, &"font", &12 and &K with six digits change the look, && is the letter itself, and
// others stand for a number or a name.
std::string WithoutPageMarks(std::string_view line);

// Of dates: sets it if it is one.
void SetDate(ContentField field, std::string_view text, ContentSink& sink);
// The text up to the end of the element that has just begun.
std::string TextOfElement(XmlPart& part);

}  // namespace fileindexd

// SPDX-License-Identifier: Apache-2.0
// The editor's own words in other languages than English.
export const PHRASES: Record<string, Record<string, string>> = {
  de: {
    "Find": "Suchen",
    "Replace": "Ersetzen",
    "next": "Weiter",
    "previous": "Zurück",
    "all": "Alle",
    "match case": "Groß/klein",
    "by word": "Ganze Wörter",
    "regexp": "Regulärer Ausdruck",
    "replace": "Ersetzen",
    "replace all": "Alle ersetzen",
    "close": "Schließen",
    "current match": "Fundstelle",
    "on line": "in Zeile",
    "replaced $ matches": "$ Fundstellen ersetzt",
    "replaced match on line $": "Fundstelle in Zeile $ ersetzt",
    "Go to line": "Gehe zu Zeile",
    "go": "Los",
    "Control character": "Steuerzeichen",
    "Selection deleted": "Auswahl gelöscht",
    "$ unchanged lines": "$ gleiche Zeilen",
  },
};

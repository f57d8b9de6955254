// SPDX-License-Identifier: Apache-2.0
// A text in its tab: the editor and the status bar below it. Decoding needs the table of the charset, so
// the editor appears when that is loaded.
import { type SearchQuery, getSearchQuery, openSearchPanel, searchPanelOpen, setSearchQuery } from "@codemirror/search";
import { ChangeSet, Compartment, EditorSelection, EditorState, type StateEffect, type Text } from "@codemirror/state";
import { EditorView, type ViewUpdate } from "@codemirror/view";
import { bytesOf, stringOf } from "../../client/src/index.js";
import type { Comparison, DocumentContent, DocumentView, LoadedDocument, Page } from "../document_view.js";
import { nameOf } from "../files/paths.js";
import { element } from "../ui/dom.js";
import { reasonText } from "../ui/text.js";
import { ByteSink, type Charset, type Charsets, type Decoded, ESCAPED } from "./charsets/index.js";
import { TextComparison } from "./comparison.js";
import { type TextDraft, formOf, makeDraft } from "./draft.js";
import { textEditor } from "./editor.js";
import { type EncodedText, type FileForm, encodeFile, fileFormOf, setFileForm } from "./file_form.js";
import { splitLines, uniform } from "./lines.js";
import { StatusBar } from "./status_bar.js";

const MOST_NAMED = 10; // lacking characters that a question names

/** What a text is edited from. */
interface Source {
  bytes: Uint8Array<ArrayBuffer>;
  charset: Charset;
  decoded: Decoded;
  byteOrderMark: boolean;
}

/** Where somebody is in a text. */
interface Place {
  line: number;
  column: number;
  scroll: StateEffect<unknown>;
  hasFocus: boolean;
  /** What is looked for, where that is open, and which of its fields has the focus. */
  search?: { query: SearchQuery; field: string | null | undefined };
}

export class TextView implements DocumentView {
  readonly element = element("div", { className: "text-view" });
  #status: StatusBar;
  #wrapping = new Compartment();
  #view: EditorView | undefined;
  #ready: Promise<void>;
  #base = new Blob();
  #baseCharset = "UTF-8";
  #changes = ChangeSet.empty(0);
  #draft: TextDraft | undefined; // that has not been applied yet
  #isClosed = false;
  #wantsFocus = false;
  #isTelling = true; // the page of what is changed

  constructor(
    private charsets: Charsets,
    private loaded: LoadedDocument,
    private page: Page,
    draft?: unknown,
  ) {
    this.#status = new StatusBar(page, {
      charsetChosen: (name) => void this.#chooseCharset(name),
      lineEndChosen: (lineEnd) => this.#setForm({ lineEnds: uniform(lineEnd) }),
      byteOrderMarkChosen: (byteOrderMark) => this.#setForm({ byteOrderMark }),
      wrapChosen: (wraps) => {
        const effects = this.#wrapping.reconfigure(wraps ? EditorView.lineWrapping : []);
        this.#view?.dispatch({ effects });
      },
    });
    this.#draft = draft as TextDraft | undefined;
    this.#ready = this.#show(loaded);
  }

  async content(): Promise<DocumentContent | undefined> {
    await this.#ready;
    const view = this.#view;
    if (!view || view.state.readOnly) {
      return undefined;
    }
    const { charset } = fileFormOf(view.state);
    if (!charset.canEncode && !(await this.#agreesToUtf8(charset))) {
      return undefined;
    }
    for (;;) {
      const form = fileFormOf(view.state);
      const { bytes, lacking } = encodeFile(view.state.doc, form);
      if (!lacking) {
        return { kind: "text", content: stringOf(bytes), encoding: form.charset.name };
      }
      if (!(await this.#settles(lacking))) {
        return undefined;
      }
    }
  }

  draft(): unknown {
    return this.#view
      ? makeDraft(this.#base, this.#baseCharset, this.#changes, fileFormOf(this.#view.state))
      : this.#draft;
  }

  replace(loaded: LoadedDocument): void {
    this.loaded = loaded;
    this.#draft = undefined;
    this.#ready = this.#show(loaded);
  }

  async compare(theirs: LoadedDocument): Promise<Comparison> {
    await this.#ready;
    const charset = theirs.readAs ?? theirs.charset ?? "UTF-8";
    const source = await this.#sourceOf(theirs);
    if (!source) {
      throw new Error(this.page.text("text.unknownCharset", { charset }));
    }
    const view = this.#view;
    if (!view) {
      throw new Error(this.page.text("text.notShown"));
    }
    const start = view.state.doc;
    const comparison = this.#comparisonOf(source, view.state);
    return {
      element: comparison.element,
      get isEdited() {
        return !comparison.changes.empty;
      },
      apply: () => {
        if (this.#view !== view || view.state.doc !== start) {
          throw new Error(this.page.text("text.changedMeanwhile"));
        }
        view.dispatch({ changes: comparison.changes, effects: setFileForm.of(fileFormOf(comparison.result)) });
      },
      close: () => comparison.close(),
    };
  }

  focus(): void {
    this.#wantsFocus = true;
    this.#view?.focus();
  }

  close(): void {
    this.#isClosed = true;
    this.#view?.destroy();
  }

  async #show(loaded: LoadedDocument): Promise<void> {
    const place = this.#view && placeIn(this.#view);
    this.element.replaceChildren(element("p", { className: "waiting", role: "status" }, this.page.text("text.loading")));
    try {
      const draft = this.#draft;
      const source = draft ? await this.#sourceOfDraft(draft) : await this.#sourceOf(loaded);
      const draftCharset = draft && (await this.charsets.open(draft.charset));
      if (this.#isClosed || loaded !== this.loaded) {
        return;
      }
      if (!source || (draft && !draftCharset)) {
        const charset = (source ? draft?.charset : draft?.baseCharset) ?? loaded.readAs ?? loaded.charset ?? "UTF-8";
        this.#refuse(this.page.text("text.unknownCharset", { charset }));
        return;
      }
      this.#edit(source, place);
      if (draft && draftCharset) {
        this.#applyDraft(draft, draftCharset);
      }
      this.#status.offer([...(await this.charsets.names()), ...ESCAPED], this.#view!.state);
    } catch (error) {
      if (loaded === this.loaded) {
        this.#refuse(this.page.text("text.failed", { reason: reasonText(error) }));
      }
    }
  }

  // Nothing when the charset is not known.
  async #sourceOf(loaded: LoadedDocument): Promise<Source | undefined> {
    const found = loaded.charset ?? "UTF-8";
    const name = loaded.readAs ?? found;
    const charset = await this.charsets.open(name);
    if (!charset) {
      return undefined;
    }
    let bytes = bytesOf(loaded.answer.data ?? "") as Uint8Array<ArrayBuffer>;
    let byteOrderMark = loaded.byteOrderMark ?? false;
    if (byteOrderMark && name !== found) {
      // What is a mark in the charset of the file is part of its text in another one.
      const sink = new ByteSink(bytes.length + 4);
      (await this.charsets.open(found))?.encode("\ufeff", sink);
      sink.reserve(bytes.length);
      sink.bytes.set(bytes, sink.length);
      sink.length += bytes.length;
      bytes = sink.result() as Uint8Array<ArrayBuffer>;
      byteOrderMark = false;
    }
    return { bytes, charset, decoded: charset.decode(bytes), byteOrderMark };
  }

  async #sourceOfDraft(draft: TextDraft): Promise<Source | undefined> {
    const bytes = new Uint8Array(await draft.base.arrayBuffer());
    const charset = await this.charsets.open(draft.baseCharset);
    return charset && { bytes, charset, decoded: charset.decode(bytes), byteOrderMark: draft.byteOrderMark };
  }

  // At `place`, where the text takes the place of another one.
  #edit({ bytes, charset, decoded, byteOrderMark }: Source, place?: Place): void {
    const { doc, lineEnds } = splitLines(decoded.text);
    this.#base = new Blob([bytes]);
    this.#baseCharset = charset.name;
    this.#changes = ChangeSet.empty(doc.length);
    this.#view?.destroy();
    const label = this.page.text("text.editor", { name: nameOf(this.loaded.path) });
    this.#view = new EditorView({
      state: EditorState.create({
        doc,
        ...(place && { selection: cursorAt(doc, place) }),
        extensions: [
          textEditor({ charset, byteOrderMark, lineEnds }, this.page, label),
          this.#wrapping.of([]),
          EditorState.readOnly.of(decoded.isDamaged),
          EditorView.updateListener.of((update) => this.#updated(update)),
        ],
      }),
      ...(place && { scrollTo: place.scroll }),
    });
    const warning = this.page.text("text.damaged", { charset: charset.name });
    this.element.replaceChildren(
      ...(decoded.isDamaged ? [element("p", { className: "problem", role: "alert" }, warning)] : []),
      this.#view.dom,
      this.#status.element,
    );
    this.#status.show(this.#view.state);
    if (place?.search) {
      searchOn(this.#view, place.search);
    }
    if (place?.hasFocus ?? this.#wantsFocus) {
      this.#view.focus();
    }
  }

  #applyDraft(draft: TextDraft, charset: Charset): void {
    this.#withoutTelling(() =>
      this.#view!.dispatch({
        changes: ChangeSet.fromJSON(draft.changes),
        effects: setFileForm.of(formOf(draft, charset)),
      }),
    );
    this.#draft = undefined;
  }

  #updated(update: ViewUpdate): void {
    if (update.docChanged) {
      this.#changes = this.#changes.compose(update.changes);
    }
    if (update.docChanged || fileFormOf(update.startState) !== fileFormOf(update.state)) {
      if (this.#isTelling) {
        this.page.changed();
      }
      this.#status.show(update.state);
    } else if (update.selectionSet) {
      this.#status.show(update.state);
    }
  }

  // Instead of a text.
  #refuse(message: string): void {
    this.#view?.destroy();
    this.#view = undefined;
    this.element.replaceChildren(element("p", { className: "problem", role: "alert" }, message));
  }

  #setForm(form: Partial<FileForm>): void {
    if (this.#view) {
      this.#view.dispatch({ effects: setFileForm.of({ ...fileFormOf(this.#view.state), ...form }) });
    }
  }

  async #chooseCharset(name: string): Promise<void> {
    const view = this.#view!;
    const choices = [{ value: "reopen", label: this.page.text("text.choose.reopen", { charset: name }), isDefault: true }];
    const isSaved = !view.state.readOnly && !ESCAPED.includes(name);
    if (isSaved) {
      choices.push({ value: "save", label: this.page.text("text.choose.save", { charset: name }), isDefault: false });
    }
    const chosen = await this.page.ask({
      title: this.page.text("text.choose.title", { charset: name }),
      message: this.page.text(isSaved ? "text.choose.message" : "text.choose.message.read", { charset: name }),
      choices: [...choices, { value: "", label: this.page.text("text.cancel") }],
    });
    if (chosen === "reopen") {
      this.page.reopen(name);
    } else if (chosen === "save") {
      await this.#saveIn(name);
    }
    if (this.#view) {
      this.#status.show(this.#view.state);
    }
  }

  async #saveIn(name: string): Promise<void> {
    try {
      this.#setForm({ charset: (await this.charsets.open(name))! });
    } catch (error) {
      this.page.tell(this.page.text("text.charset.failed", { charset: name, reason: reasonText(error) }), "problem");
    }
  }

  async #agreesToUtf8(charset: Charset): Promise<boolean> {
    const chosen = await this.page.ask({
      title: this.page.text("text.escapes.title"),
      message: this.page.text("text.escapes.message", { charset: charset.name }),
      choices: [
        { value: "yes", label: this.page.text("text.escapes.yes"), isDefault: true },
        { value: "", label: this.page.text("text.cancel") },
      ],
    });
    if (chosen === "yes") {
      this.#settle({ charset: (await this.charsets.open("UTF-8"))! });
    }
    return chosen === "yes";
  }

  // Asks what becomes of characters that the charset lacks. Whether the text can be saved then.
  async #settles(lacking: NonNullable<EncodedText["lacking"]>): Promise<boolean> {
    const { charset } = fileFormOf(this.#view!.state);
    const kind = charset.isUnicode ? "halves" : "lacking";
    const settlement = charset.isUnicode ? "replace" : "utf8";
    const named = [...lacking.characters].slice(0, MOST_NAMED).join(" ");
    const characters = lacking.characters.size > MOST_NAMED ? `${named} ...` : named;
    const chosen = await this.page.ask({
      title: this.page.text(`text.${kind}.title`),
      message: this.page.text(`text.${kind}.message`, { charset: charset.name, count: lacking.count, characters }),
      choices: [
        { value: settlement, label: this.page.text(`text.${kind}.${settlement}`), isDefault: true },
        { value: "show", label: this.page.text("text.lacking.show") },
        { value: "", label: this.page.text("text.cancel") },
      ],
    });
    if (chosen === "utf8") {
      this.#settle({ charset: (await this.charsets.open("UTF-8"))! });
    } else if (chosen === "replace") {
      this.#settle({}, this.#halvesReplaced());
    } else if (chosen === "show") {
      this.#view!.dispatch({ selection: EditorSelection.cursor(lacking.first), scrollIntoView: true });
      this.#view!.focus();
    }
    return chosen === settlement;
  }

  #halvesReplaced(): { from: number; to: number; insert: string }[] {
    const changes = [];
    let position = 0;
    for (const part of this.#view!.state.doc.iter()) {
      for (const { index } of part.matchAll(/\p{Surrogate}/gu)) {
        changes.push({ from: position + index, to: position + index + 1, insert: "\ufffd" });
      }
      position += part.length;
    }
    return changes;
  }

  #settle(form: Partial<FileForm>, changes: { from: number; to: number; insert: string }[] = []): void {
    const view = this.#view!;
    this.#withoutTelling(() =>
      view.dispatch({ changes, effects: setFileForm.of({ ...fileFormOf(view.state), ...form }) }),
    );
  }

  // For changes that are part of the save that is under way, or that the page knows as a draft.
  #withoutTelling(change: () => void): void {
    this.#isTelling = false;
    try {
      change();
    } finally {
      this.#isTelling = true;
    }
  }

  #comparisonOf({ decoded, charset, byteOrderMark }: Source, mine: EditorState): TextComparison {
    const { doc, lineEnds } = splitLines(decoded.text);
    const [theirLabel, myLabel] = [this.page.text("text.theirs"), this.page.text("text.mine")];
    const form = { charset, byteOrderMark, lineEnds };
    return new TextComparison(
      { label: theirLabel, doc, extensions: textEditor(form, this.page, theirLabel) },
      { label: myLabel, doc: mine.doc, extensions: textEditor(fileFormOf(mine), this.page, myLabel) },
      this.page.text("comparison.take"),
    );
  }
}

function placeIn(view: EditorView): Place {
  const { head } = view.state.selection.main;
  const { number, from } = view.state.doc.lineAt(head);
  const field = view.dom.querySelector(".cm-search :focus")?.getAttribute("name");
  const search = searchPanelOpen(view.state) ? { query: getSearchQuery(view.state), field } : undefined;
  const place = { line: number, column: head - from, scroll: view.scrollSnapshot(), hasFocus: view.hasFocus };
  return { ...place, ...(search && { search }) };
}

// Opens the search again, which takes the focus, and gives that back.
function searchOn(view: EditorView, { query, field }: NonNullable<Place["search"]>): void {
  const focused = document.activeElement as HTMLElement | null;
  openSearchPanel(view);
  view.dispatch({ effects: setSearchQuery.of(query) });
  const found = view.dom.querySelector<HTMLInputElement>(`.cm-search [name="${field}"]`);
  (found ?? focused)?.focus();
  if (found?.type === "text") {
    found.setSelectionRange(found.value.length, found.value.length); // to type on
  }
}

function cursorAt(doc: Text, { line, column }: Place): EditorSelection {
  const { from, to } = doc.line(Math.min(line, doc.lines));
  return EditorSelection.single(Math.min(from + column, to));
}

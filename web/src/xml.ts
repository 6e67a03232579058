// A parser for the two XML documents of a pyramid file, of unknown origin: time and memory stay in proportion
// to the text. Document types, and so all entities of a document's own, are refused, and what is not
// well-formed is refused as a whole.
import { FormatError } from "./errors.js";

/** Hears a document out. `text` comes in pieces, that end at every markup and begin at every reference. */
export interface Listener {
  open(name: string): void;
  close(name: string): void;
  text(piece: string): void;
}

// What the format allows; these do not change.
const MAX_DEPTH = 64;
const MAX_NODES = 1 << 20;
const MAX_FOREIGN_NAMES = 256;
const MAX_ATTRIBUTES = 64;

const KNOWN = new Set(
  (
    "DATASET BANDSTATISTICS HISTOGRAMS PALETTE HEADER " +
    "LEVEL BAND MINIMUM MAXIMUM MEAN STANDARDDEVIATION SUM SUM2 RMS SUMXY COV ".replace(/(\w+)/g, "RSTC_$1") +
    "LEVEL BAND SOURCE BINCOUNT BINSIZE MIN MAX TYPE COUNTS ".replace(/(\w+)/g, "HIST_$1") +
    "VERSION_MAJOR VERSION_MINOR BANDS PIXEL_WIDTH PIXEL_HEIGHT TILESIZE LEVELMIN LEVELMAX INTERLEAVE BUILD_METHOD PIXEL_TYPE ".replace(
      /(\w+)/g,
      "HEADER_$1",
    ) +
    "BAND COUNT RGBA".replace(/(\w+)/g, "PALETTE_$1")
  ).split(" "),
);

const START =
  ":A-Z_a-z\\u00C0-\\u00D6\\u00D8-\\u00F6\\u00F8-\\u02FF\\u0370-\\u037D\\u037F-\\u1FFF\\u200C\\u200D\\u2070-\\u218F\\u2C00-\\u2FEF\\u3001-\\uD7FF\\uF900-\\uFDCF\\uFDF0-\\uFFFD";
const NAME = new RegExp(`[${START}][-.0-9\\u00B7\\u0300-\\u036F\\u203F\\u2040${START}]*`, "y");
const SPACE = /[ \t\r\n]*/y;
const REFERENCE = /&(?:#(\d+)|#x([\da-fA-F]+)|(lt|gt|amp|quot|apos));/y;
const VALUE = /[ \t\r\n]*=[ \t\r\n]*(?:"([^"<]*)"|'([^'<]*)')/y;
const FORBIDDEN = /[\0-\x08\x0B\x0C\x0E-\x1F\uFFFE\uFFFF]/;
const DECLARATION =
  /^<\?xml[ \t\r\n]+version[ \t\r\n]*=[ \t\r\n]*(?:"1\.[ -!#-~]*"|'1\.[ -&(-~]*')(?:[ \t\r\n]+encoding[ \t\r\n]*=[ \t\r\n]*(?:"([A-Za-z][\w.-]*)"|'([A-Za-z][\w.-]*)'))?(?:[ \t\r\n]+standalone[ \t\r\n]*=[ \t\r\n]*(?:"(?:yes|no)"|'(?:yes|no)'))?[ \t\r\n]*\?>/;
const NAMED: Record<string, string> = { lt: "<", gt: ">", amp: "&", quot: '"', apos: "'" };
const ENCODINGS: Record<string, string> = {
  "UTF-8": "utf-8",
  UTF8: "utf-8",
  "US-ASCII": "ascii",
  USASCII: "ascii",
  ASCII: "ascii",
  US_ASCII: "ascii",
  "ISO-8859-1": "latin1",
  "ISO8859-1": "latin1",
  "ISO_8859-1": "latin1",
  LATIN1: "latin1",
};
// These have no sign of one byte: a text that can be read so far is in another encoding.
const WIDE = /^(UTF-?16|UCS-?[24]|ISO-10646-UCS-[24])/;

const refuse = (reason: string): never => {
  throw new FormatError(reason);
};

/** The text of a document in the encoding that its declaration names. */
export function decodeDocument(bytes: Uint8Array): string {
  const start = String.fromCharCode(...bytes.subarray(0, 512)).replace(/^\xEF\xBB\xBF/, "");
  const declared = DECLARATION.exec(start);
  const name = (declared?.[1] ?? declared?.[2] ?? "UTF-8").toUpperCase();
  const encoding = ENCODINGS[name] ?? (WIDE.test(name) ? "utf-8" : name);
  if (encoding === "ascii" && bytes.some((byte) => byte > 127)) refuse("it is not in the encoding that it names");
  if (encoding === "latin1") {
    let text = "";
    for (let at = 0; at < bytes.length; at += 8192) text += String.fromCharCode(...bytes.subarray(at, at + 8192));
    return text;
  }
  try {
    return new TextDecoder(encoding === "ascii" ? "utf-8" : encoding, { fatal: true }).decode(bytes);
  } catch {
    return refuse("it is not in the encoding that it names");
  }
}

class Parser {
  private at = 0;
  private nodes = 0;
  private readonly open: string[] = [];
  private readonly foreign = new Set<string>();

  constructor(
    private readonly source: string,
    private readonly listener: Listener,
  ) {}

  run(): void {
    if (FORBIDDEN.test(this.source)) refuse("it holds a character that no document may have");
    const declared = DECLARATION.exec(this.source);
    if (declared) this.at = declared[0].length;
    let roots = 0;
    for (;;) {
      this.skip(SPACE);
      if (this.at === this.source.length) break;
      if (this.source[this.at] !== "<") refuse("it has a text outside of its root");
      if (this.markup() && ++roots > 1) refuse("it has two roots");
      while (this.open.length) this.content();
    }
    if (!roots) refuse("it has no root");
  }

  // What stands inside of an element, up to the next markup and with it.
  private content(): void {
    const next = this.source.indexOf("<", this.at);
    if (next < 0) refuse("it ends within an element");
    this.characters(this.source.slice(this.at, next));
    this.at = next;
    if (this.source.startsWith("</", next)) return this.endTag();
    if (this.source.startsWith("<![CDATA[", next)) {
      this.takeNode();
      // A section is a piece even if it is empty.
      this.listener.text(lineEnds(this.until("]]>", 9), 0));
    } else this.markup();
  }

  private characters(text: string): void {
    if (text.includes("]]>")) refuse("]]> stands in a text");
    let from = 0;
    // A character that a reference stands for begins a piece, with what follows it.
    let first = "";
    for (let at = text.indexOf("&"); ; at = text.indexOf("&", from)) {
      const piece = first + text.slice(from, at < 0 ? undefined : at);
      if (piece) this.listener.text(lineEnds(piece, first.length));
      if (at < 0) return;
      first = this.reference(text, at);
      from = REFERENCE.lastIndex;
    }
  }

  private reference(text: string, at: number): string {
    REFERENCE.lastIndex = at;
    const match = REFERENCE.exec(text) ?? refuse("it has an entity, or & stands by itself");
    if (match[3]) return NAMED[match[3]] as string;
    const code = match[1] ? Number(match[1]) : parseInt(match[2] as string, 16);
    const surrogate = code >= 0xd800 && code < 0xe000;
    if (!(code <= 0x10ffff) || surrogate || FORBIDDEN.test(String.fromCodePoint(code)))
      refuse("a reference stands for a character that no document may have");
    return String.fromCodePoint(code);
  }

  // One markup that is neither the end of an element nor CDATA; true for an element.
  private markup(): boolean {
    const { source, at } = this;
    if (source.startsWith("<!--", at)) {
      this.takeNode();
      const text = this.until("-->", 4);
      if (text.includes("--") || text.endsWith("-")) refuse("-- stands in a comment");
      return false;
    }
    if (source.startsWith("<?", at)) return this.instruction();
    if (source.startsWith("<!", at)) refuse("it has a document type, or other markup that is not read");
    this.startTag();
    return true;
  }

  private instruction(): boolean {
    this.takeNode();
    this.at += 2;
    const target = this.name();
    if (/^xml$/i.test(target)) refuse("an XML declaration stands where it may not");
    const rest = this.until("?>", 0);
    if (rest && !/^[ \t\r\n]/.test(rest)) refuse("an instruction is malformed");
    return false;
  }

  private startTag(): void {
    this.at++;
    const name = this.name();
    this.takeNode();
    if (this.open.length >= MAX_DEPTH) refuse("elements are nested too deeply");
    if (!KNOWN.has(name)) this.takeName(name);
    this.attributes();
    const empty = this.source[this.at] === "/";
    if (empty) this.at++;
    if (this.source[this.at++] !== ">") refuse("a tag is malformed");
    this.listener.open(name);
    if (empty) this.listener.close(name);
    else this.open.push(name);
  }

  private attributes(): void {
    const seen = new Set<string>();
    while (this.skip(SPACE) && !"/>".includes(this.source[this.at] ?? ">")) {
      const name = this.name();
      if (seen.has(name)) refuse("an attribute stands twice");
      if (seen.size >= MAX_ATTRIBUTES) refuse("an element has too many attributes");
      seen.add(name);
      this.takeName(name);
      VALUE.lastIndex = this.at;
      const match = VALUE.exec(this.source) ?? refuse("an attribute is malformed");
      this.at = VALUE.lastIndex;
      const value = match[1] ?? (match[2] as string);
      for (let i = value.indexOf("&"); i >= 0; i = value.indexOf("&", i + 1)) this.reference(value, i);
    }
  }

  private endTag(): void {
    this.at += 2;
    const name = this.name();
    this.skip(SPACE);
    if (this.source[this.at++] !== ">" || name !== this.open.pop()) refuse("a tag closes another element");
    this.listener.close(name);
  }

  private name(): string {
    NAME.lastIndex = this.at;
    const match = NAME.exec(this.source) ?? refuse("a name is malformed");
    this.at = NAME.lastIndex;
    return match[0];
  }

  private takeName(name: string): void {
    this.foreign.add(name);
    if (this.foreign.size > MAX_FOREIGN_NAMES) refuse("it has too many unknown names");
  }

  private takeNode(): void {
    if (++this.nodes > MAX_NODES) refuse("it has too many elements");
  }

  // Whether anything was skipped.
  private skip(pattern: RegExp): boolean {
    pattern.lastIndex = this.at;
    pattern.exec(this.source);
    const moved = pattern.lastIndex > this.at;
    this.at = pattern.lastIndex;
    return moved;
  }

  // What stands from `start` characters on up to `end`, and goes behind that.
  private until(end: string, start: number): string {
    const from = this.at + start;
    const found = this.source.indexOf(end, from);
    if (found < 0) refuse("it ends within markup");
    this.at = found + end.length;
    return this.source.slice(from, found);
  }
}

// All ends of lines are one character, but for one that a reference stands for.
const lineEnds = (text: string, keep: number): string => text.slice(0, keep) + text.slice(keep).replace(/\r\n?/g, "\n");

/**
 * Reads a document from its bytes and tells `listener` of it.
 * @throws FormatError where it is malformed or beyond the limits of the format; `listener` has then heard a part.
 */
export function parseDocument(bytes: Uint8Array, listener: Listener): void {
  new Parser(decodeDocument(bytes), listener).run();
}

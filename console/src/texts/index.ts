import { en } from './en';
import { fill, type Arguments, type Catalogue } from './message';

export type Texts = typeof en;
export type TextKey = keyof Texts;
// Keys of texts without parameters.
export type PlainKey = { [K in TextKey]: Arguments<Texts[K]> extends [] ? K : never }[TextKey];

let language = 'en';
let texts: Catalogue = en;

// Another language: a catalogue with the same keys. To be called before the page is drawn.
export function setLanguage(name: string, catalogue: { readonly [K in TextKey]: Catalogue[string] }): void {
  language = name;
  texts = catalogue;
  document.documentElement.lang = name;
}

export function currentLanguage(): string {
  return language;
}

// The text of a key, with its parameters filled in.
export function t<K extends TextKey>(key: K, ...rest: Arguments<Texts[K]>): string {
  const message = texts[key] ?? en[key];
  return fill(message, language, (rest as [Record<string, string | number>?])[0]);
}

export * from './format';

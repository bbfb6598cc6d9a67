// Texts with parameters: "{name}" stands for a parameter; a text with a count has a form for each plural category of
// the language ("other" always).

export type Plural = { readonly other: string } & {
  readonly [C in Exclude<Intl.LDMLPluralRule, 'other'>]?: string;
};
export type Message = string | Plural;
export type Catalogue = Readonly<Record<string, Message>>;

type Names<S extends string> = S extends `${string}{${infer Name}}${infer Rest}` ? Name | Names<Rest> : never;
type NamesOf<M> = M extends string
  ? Names<M>
  : M extends { readonly other: infer S extends string }
    ? Names<S> | 'count'
    : never;

type Value<Name> = Name extends 'count' ? number : string | number;
export type Parameters<M> = { [Name in NamesOf<M>]: Value<Name> };
// The arguments after the key: none for a text without parameters.
export type Arguments<M> = [NamesOf<M>] extends [never] ? [] : [parameters: Parameters<M>];

const rules = new Map<string, Intl.PluralRules>();
const numbers = new Map<string, Intl.NumberFormat>();

function cached<T>(map: Map<string, T>, language: string, make: () => T): T {
  let found = map.get(language);
  if (found === undefined) {
    found = make();
    map.set(language, found);
  }
  return found;
}

export function fill(
  message: Message,
  language: string,
  parameters: Record<string, string | number> = {},
): string {
  let text: string;
  if (typeof message === 'string') {
    text = message;
  } else {
    const rule = cached(rules, language, () => new Intl.PluralRules(language));
    text = message[rule.select(Number(parameters.count))] ?? message.other;
  }
  const number = cached(numbers, language, () => new Intl.NumberFormat(language));
  return text.replace(/\{(\w+)\}/g, (whole, name: string) => {
    const value = parameters[name];
    if (value === undefined) return whole;
    return typeof value === 'number' ? number.format(value) : value;
  });
}

import type { KnownList } from '../api/types';

// The domains to choose from: the own one, then those that have lists or are trusted, by name, each once.
export function choices(own: string, lists: readonly KnownList[], known: readonly string[]): string[] {
  const others = new Set([...lists.map((list) => list.domain), ...known].map((name) => name.toUpperCase()));
  others.delete(own.toUpperCase());
  return [own, ...[...others].sort((first, second) => (first < second ? -1 : 1))];
}

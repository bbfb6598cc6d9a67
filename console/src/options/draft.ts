import {
  conflictingOptions,
  OPTION_NAMES,
  parseDepth,
  SWITCHES,
  type DomainOptions,
  type OptionName,
  type SwitchName,
} from '../rules/options';

// The form as it is filled in.
export interface Draft {
  // What was stored when it was last read.
  base: DomainOptions;
  switches: Record<SwitchName, boolean>;
  // As typed.
  depth: string;
  // Changed here and, to something else, elsewhere: nothing is saved until it is decided which holds.
  conflicts: OptionName[];
  // Changed elsewhere, and taken over here.
  elsewhere: OptionName[];
}

export function draftOf(stored: DomainOptions): Draft {
  const switches = Object.fromEntries(SWITCHES.map((name) => [name, stored[name]])) as Record<
    SwitchName,
    boolean
  >;
  return { base: stored, switches, depth: String(stored.domain_nested_group), conflicts: [], elsewhere: [] };
}

export const discarded = draftOf;

// What the form asks for; null while the depth is none.
export function wantedOf(draft: Draft): DomainOptions | null {
  const depth = parseDepth(draft.depth);
  return depth === null ? null : { ...draft.switches, domain_nested_group: depth };
}

// The draft above what is stored now: what was not touched here takes the stored value.
export function merged(draft: Draft, stored: DomainOptions): Draft {
  const { base } = draft;
  const changed = OPTION_NAMES.filter((name) => stored[name] !== base[name]);
  if (changed.length === 0) return draft;
  // A depth that can't be is a change, too; it agrees with nothing.
  const wanted = wantedOf(draft) ?? { ...draft.switches, domain_nested_group: Number.NaN };
  const conflicts = conflictingOptions(base, stored, wanted);
  const taken = (name: OptionName) => wanted[name] === base[name];
  const switches = Object.fromEntries(
    SWITCHES.map((name) => [name, taken(name) ? stored[name] : draft.switches[name]]),
  ) as Record<SwitchName, boolean>;
  return {
    base: stored,
    switches,
    depth: taken('domain_nested_group') ? String(stored.domain_nested_group) : draft.depth,
    conflicts: [...new Set([...draft.conflicts, ...conflicts])],
    elsewhere: [...new Set([...draft.elsewhere, ...changed.filter(taken)])],
  };
}

import type { DomainRow } from '../api/types';

export interface ShownRow {
  name: string;
  // The domain's DNS name, or the place of an organisational unit; may be empty.
  value: string;
  // What a search looks into.
  text: string;
}

// With trusted domains: domains, the own one first. Without: the organisational units of the own domain.
export interface ShownList {
  kind: 'domains' | 'units';
  // Of units: the own domain's name.
  workgroup: string;
  rows: ShownRow[];
}

// No domain has this name: it marks a list of organisational units.
const kUnits = '--';

export function shownList(rows: readonly DomainRow[]): ShownList {
  const [first] = rows;
  const units = first !== undefined && first[0] === kUnits;
  return {
    kind: units ? 'units' : 'domains',
    workgroup: units ? first[2] : '',
    rows: (units ? rows.slice(1) : rows).map(([name, , value]) => ({
      name,
      value,
      text: `${name}\n${value}`.toLowerCase(),
    })),
  };
}

export function matching(rows: ShownRow[], search: string): ShownRow[] {
  const wanted = search.trim().toLowerCase();
  return wanted === '' ? rows : rows.filter((row) => row.text.includes(wanted));
}

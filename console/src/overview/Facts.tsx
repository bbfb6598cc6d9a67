import type { ReactNode } from 'react';

// Pairs of a name and a value; those without a value are left out.
export function Facts({ items }: { items: [name: string, value: ReactNode][] }) {
  return (
    <dl className="vorn-facts">
      {items
        .filter(([, value]) => value !== null && value !== '')
        .map(([name, value]) => (
          <Fact key={name} name={name} value={value} />
        ))}
    </dl>
  );
}

function Fact({ name, value }: { name: string; value: ReactNode }) {
  return (
    <>
      <dt>{name}</dt>
      <dd>{value}</dd>
    </>
  );
}

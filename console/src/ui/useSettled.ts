import { useEffect, useState } from 'react';

export const kPause = 500;

// False from each change of `value` until it has stayed the same for a while: a complaint about half a word helps
// nobody. Also false at first.
export function useSettled(value: string): boolean {
  const [settled, setSettled] = useState<string | null>(null);
  const [first] = useState(value);
  useEffect(() => {
    const timer = setTimeout(() => setSettled(value), kPause);
    return () => clearTimeout(timer);
  }, [value]);
  return settled === value && value !== first;
}

import { Spinner } from '@patternfly/react-core/dist/esm/components/Spinner';
import { useEffect, useState } from 'react';
import { t } from '../texts';

const kSlow = 8000;

interface LoadingProps {
  // What is being waited for; "Loading…" when absent.
  text?: string;
  // Beside other content rather than in the middle of an empty view.
  inline?: boolean;
  // This is known to take long: nothing is said about it.
  patient?: boolean;
}

// A spinner with words. Every request behind it has a deadline, so it gives way to a result or an error.
export function Loading({ text = t('common.loading'), inline = false, patient = false }: LoadingProps) {
  const [slow, setSlow] = useState(false);
  useEffect(() => {
    const timer = setTimeout(() => setSlow(true), kSlow);
    return () => clearTimeout(timer);
  }, []);
  return (
    <div className={inline ? 'vorn-loading vorn-loading--inline' : 'vorn-loading'} role="status">
      <Spinner size={inline ? 'md' : 'lg'} aria-hidden="true" />
      <span>{slow && !patient ? `${text} ${t('common.loading.slow')}` : text}</span>
    </div>
  );
}

import { formatAge, formatExactTime } from '../../texts';
import { useNow } from '../../ui';

const kTick = 10_000;

// How long ago something was; the exact time on hover, and for a screen reader.
export function Age({ seconds }: { seconds: number }) {
  const now = useNow(kTick);
  const exact = formatExactTime(seconds);
  return (
    <time dateTime={new Date(seconds * 1000).toISOString()} title={exact}>
      {formatAge(seconds, now)}
      <span className="pf-v6-screen-reader"> ({exact})</span>
    </time>
  );
}
